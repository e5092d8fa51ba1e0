#pragma once

#include <cstddef>
#include <expected>
#include <string>
#include <vector>

#include "Zephrin/ZPDaemonClient.h"
#include "Zephrin/ZPPlugInCore.h"

namespace example {

// Makes a plug-in ready, starts it, and says lines to it, each of which it answers with one. Waits
// for it, a few seconds at most for each. The other side of the result is a text for people. The
// plug-in ends when the talk is over.
[[nodiscard]] std::expected<std::vector<std::string>, std::string>
talkWith(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn, const std::vector<std::string>& lines);

// How large a file of the plug-in's bundle is, as the host learns by a token: it needs no right of
// its own to open the file.
[[nodiscard]] std::expected<std::size_t, std::string>
sizeByToken(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn, const std::string& file);

} // namespace example
