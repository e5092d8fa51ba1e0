#pragma once

#include <expected>
#include <optional>
#include <string>
#include <vector>

#include "platform/file/File.h"
#include "zpctl/Application.h"

namespace zpctl {

// The folder with this box's applications, for changing it. Whoever holds one is alone: all others
// wait. Each change is one step for everybody who looks, and for a box that loses its power: an
// application is the old one or the new one, never half of one, never gone meanwhile. What a run
// that was killed has left, under names with a dot, goes when the folder is opened the next time.
// One thread.
class ApplicationFolder {
public:
    // What a change did besides what it was asked for.
    struct Outcome {
        bool replaced = false;
        // Why what was there before is still there under a hidden name.
        std::optional<std::string> leftOver;
    };

    // Makes the folder when it is missing. On failure the reason, also when others could change
    // what is in it, or when somebody else changes it for too long.
    [[nodiscard]] static std::expected<ApplicationFolder, std::string>
    open(const std::string& path);

    [[nodiscard]] const std::string& path() const { return path_; }

    // Those in it that can be read, in order of their names.
    [[nodiscard]] std::vector<Application> applications() const;

    // Puts a copy into the folder, under the application's own name, in place of what has that
    // name. On failure the reason; then nothing has changed, unless the reason says so.
    [[nodiscard]] std::expected<Outcome, std::string> put(const Application& application) const;
    // Takes what has that name out of the folder and removes it; the same of failures.
    [[nodiscard]] std::expected<Outcome, std::string> take(const std::string& name) const;

private:
    ApplicationFolder(std::string path, platform::UniqueFd folder, platform::UniqueFd lock)
        : path_(std::move(path)), folder_(std::move(folder)), lock_(std::move(lock)) {}

    [[nodiscard]] std::optional<std::string> clearLeftOvers() const;
    [[nodiscard]] std::optional<std::string> copyHere(const Application& application) const;
    [[nodiscard]] std::expected<bool, int> exchange(const std::string& name) const;
    [[nodiscard]] std::expected<Outcome, std::string> finish(bool replaced,
                                                             const char* hiddenName) const;

    std::string path_; // canonical
    platform::UniqueFd folder_;
    platform::UniqueFd lock_; // holds the lock until it is closed
};

} // namespace zpctl
