#include "zpd/ZPDExtensionPoints.h"

#include "AppRegistry/ARApplicationWorkspace.h"

std::optional<platform::Dictionary>
ZPDExtensionPoints::sdkEntry(std::string_view identifier) const {
    auto point = workspace_.extensionPointForIdentifier(identifier);
    return point ? std::move(point->sdkEntry) : std::nullopt;
}
