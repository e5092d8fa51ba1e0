#pragma once

#include <expected>
#include <string>

#include "platform/file/File.h"

namespace platform {

// Keeps other tools that change the same folder away, for as long as the descriptor is open. Waits
// for one that holds the lock, but not for ever. `folder` is open and at `path`, which is for the
// text alone; the lock is a file of that name in it, which stays. On failure the reason. Any
// thread.
[[nodiscard]] std::expected<UniqueFd, std::string> lockInFolder(int folder, const char* name,
                                                                const std::string& path);

} // namespace platform
