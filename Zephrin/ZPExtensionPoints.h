#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value/Value.h"

// Where the plug-in records of a process find extension points (ZPPlugInCore::setExtensionPoints).
// Asked by any thread, by several at a time.
class ZPExtensionPoints {
public:
    virtual ~ZPExtensionPoints() = default;
    // The SDK dictionary of the extension point; nothing when there is no such point, or it has
    // none.
    [[nodiscard]] virtual std::optional<platform::Dictionary>
    sdkEntry(std::string_view identifier) const = 0;
};

// The files of the ExtensionPoints folders, read anew with every question, under the rules by which
// the daemon's registry takes them in. What a process has unless it sets something else.
class ZPExtensionPointFolders final : public ZPExtensionPoints {
public:
    explicit ZPExtensionPointFolders(std::vector<std::string> folders)
        : folders_(std::move(folders)) {}

    [[nodiscard]] std::optional<platform::Dictionary>
    sdkEntry(std::string_view identifier) const override;

private:
    const std::vector<std::string> folders_;
};
