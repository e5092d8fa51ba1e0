#pragma once

#include <optional>
#include <string_view>

#include "Zephrin/ZPExtensionPoints.h"

class ARApplicationWorkspace;

// The extension points that the daemon's registry knows, for its plug-in records. The workspace
// must outlive it. Any thread.
class ZPDExtensionPoints final : public ZPExtensionPoints {
public:
    explicit ZPDExtensionPoints(ARApplicationWorkspace& workspace) : workspace_(workspace) {}

    [[nodiscard]] std::optional<platform::Dictionary>
    sdkEntry(std::string_view identifier) const override;

private:
    ARApplicationWorkspace& workspace_;
};
