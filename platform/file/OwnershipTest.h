#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/types.h>
#include <unordered_map>

namespace platform {

// Who may change a path: passes when the file and every folder above it belong to root or to the
// daemon's user and nobody else can write them (sticky folders aside, as long as their owner is
// one of the two), and no program serves the file system that they are on, as it may say of its
// files what it likes. The answers for folders are remembered as long as the object lives: make one
// for one look, or for one pass over many files. Folders are asked from the top down, and nothing
// below one that fails is looked at: it might lie on a file system of its owner's. One thread at a
// time.
class OwnershipTest {
public:
    // On refusal the reason. `canonicalPath` is absolute and free of symbolic links.
    [[nodiscard]] std::optional<std::string> refusal(const std::string& canonicalPath);
    // The same for the file alone; `path` only for the text.
    [[nodiscard]] static std::optional<std::string> refusalOf(const struct ::stat& status,
                                                              std::string_view path);

private:
    [[nodiscard]] std::optional<std::string> folderRefusal(const std::string& folder);

    std::unordered_map<std::string, std::optional<std::string>> folders_;
};

} // namespace platform
