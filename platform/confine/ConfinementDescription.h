#pragma once

#include "platform/confine/ConfinementPlan.h"
#include "platform/confine/KernelFeatures.h"
#include "platform/confine/Profile.h"
#include "platform/value/Value.h"

namespace platform {

// {"wanted": …, "enforced": …}: what guards each side of a plug-in's confinement, on a kernel that
// has everything and on this one.
[[nodiscard]] Dictionary describeConfinement(const ConfinementPlan& plan, const Profile& profile,
                                             const KernelFeatures& features);

} // namespace platform
