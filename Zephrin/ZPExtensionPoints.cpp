#include "Zephrin/ZPExtensionPoints.h"

#include "platform/bundle/ExtensionPoints.h"

std::optional<platform::Dictionary>
ZPExtensionPointFolders::sdkEntry(std::string_view identifier) const {
    return platform::readExtensionPoint(folders_, identifier);
}
