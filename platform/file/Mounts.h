#pragma once

#include <cstdint>
#include <string_view>

namespace platform {

// Whether the mount of this number (statx's stx_mnt_id), by the text of /proc/self/mountinfo, is of
// a kind that a program serves (FUSE): any user may make one where he owns the folder, and says
// himself to whom its files belong. True also when the text does not tell.
[[nodiscard]] bool isServedByProgram(std::uint64_t mount, std::string_view mountInfo);

// The same of this process's mounts as they are now.
[[nodiscard]] bool isServedByProgram(std::uint64_t mount);

} // namespace platform
