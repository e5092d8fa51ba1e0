#pragma once

#include <optional>

#include "platform/confine/ConfinementPlan.h"
#include "platform/confine/Landlock.h"
#include "platform/confine/Profile.h"
#include "platform/value/Error.h"

namespace platform {

// Adds to the rules every path that a plug-in of this plan and profile may use. What of the system
// is not there is left out; a bundle or container that is not there is an error.
[[nodiscard]] std::optional<Error> addFileRules(int ruleset, const ConfinementPlan& plan,
                                                const Profile& profile,
                                                const KernelFeatures& features);

// Adds what of /proc tells a process of itself (its memory map, which run-time libraries ask for).
// By the calling process itself; async-signal-safe. Where /proc is not there it goes without.
void addOwnProcess(int ruleset) noexcept;

} // namespace platform
