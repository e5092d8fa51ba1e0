#pragma once

#include <expected>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"

// One folder that the registry looks into: its descriptor, and whether it can be trusted. What
// lies in it is reached through the descriptor, so that a long path is walked once. Owned by the
// pass that opened it.
class ARFolder {
public:
    enum class EntryType { folder, link, other };

    struct Entry {
        std::string name;
        EntryType type;
    };

    // Opens a folder by its canonical path and tests it and all folders above. On failure errno.
    [[nodiscard]] static std::expected<ARFolder, int> open(const std::string& canonicalPath,
                                                           platform::OwnershipTest& ownership);
    // Opens a folder by its name in this one, links refused; tests it alone, since this one passed.
    [[nodiscard]] std::expected<ARFolder, int> openWithin(const std::string& name) const;

    [[nodiscard]] int descriptor() const { return descriptor_.get(); }

    [[nodiscard]] const std::string& path() const { return path_; }

    // Why nothing in here counts; nothing when it does.
    [[nodiscard]] const std::optional<std::string>& refusal() const { return refusal_; }

    [[nodiscard]] std::string pathOf(std::string_view name) const;

    // What lies under a name; nothing when there is nothing, or it cannot be told.
    [[nodiscard]] std::optional<EntryType> typeOf(const std::string& name) const;

    // What ends with `suffix` and does not begin with a dot, in order of the names. On failure
    // errno.
    [[nodiscard]] std::expected<std::vector<Entry>, int> entries(std::string_view suffix) const;

private:
    platform::UniqueFd descriptor_;
    std::string path_;
    std::optional<std::string> refusal_;
};

// The last component, and what is above it ("/" at the top).
[[nodiscard]] std::string_view ARNameOf(std::string_view path);
[[nodiscard]] std::string_view ARFolderOf(std::string_view path);
[[nodiscard]] std::string ARPathIn(std::string_view folder, std::string_view name);
// True for a name that ends with `suffix`, is longer and does not begin with a dot.
[[nodiscard]] bool ARIsNamed(std::string_view name, std::string_view suffix);
