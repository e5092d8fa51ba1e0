#pragma once

#include <cstdint>
#include <seccomp.h>

#include "platform/confine/CallFilter.h"

namespace platform {

// Stands in rules for the process id of the plug-in's first process, which is known only when the
// filter is installed. No process has it.
inline constexpr std::uint32_t ownProcess = 0x5a657068;

// Calls up to this number were known when the rules were written: what of them is not allowed is
// refused (EPERM). A newer one "is not there" (ENOSYS), so that libraries fall back to an older.
inline constexpr std::uint32_t newestKnownCall = 450;

// Adds every call that this kind of plug-in may make. 0, or a negative errno value.
[[nodiscard]] int addCallRules(scmp_filter_ctx filter, const CallFilterKind& kind);

} // namespace platform
