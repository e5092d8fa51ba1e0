#pragma once

#include <expected>
#include <string>
#include <vector>

#include "Zephrin/ZPDaemonClient.h"
#include "Zephrin/ZPPlugInCore.h"

namespace example {

// The plug-ins that this program may use at an extension point, as the daemon tells; an empty
// identifier stands for all extension points. Waits for the daemon, a few seconds at most. The
// other side of the result is a text for people.
[[nodiscard]] std::expected<std::vector<ZPPlugInCore::Ptr>, std::string>
plugInsAt(ZPDaemonClient& daemon, const std::string& extensionPoint);

} // namespace example
