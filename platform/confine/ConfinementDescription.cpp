#include "platform/confine/ConfinementDescription.h"

namespace platform {

namespace {

constexpr KernelFeatures everything{
    .noNewPrivileges = true, .systemCallFilters = true, .landlock = 6};

constexpr const char* byLandlock(bool guarded, const char* otherwise) {
    return guarded ? "landlock" : otherwise;
}

Dictionary description(const ConfinementPlan& plan, const Profile& profile,
                       const KernelFeatures& features) {
    Dictionary made{
        {"profile", profile.name},
        {"bundle", plan.bundle},
        {"privileges", "no_new_privs"},
        {"calls", "seccomp"},
        {"files", byLandlock(features.guardsFiles(), "nothing")},
        {"truncation", byLandlock(features.guardsTruncation(), "seccomp")},
        {"devices", byLandlock(features.guardsDeviceControls(), "seccomp")},
        {"signals", byLandlock(features.hasScopes(), "seccomp")},
        {"unixSockets", byLandlock(features.hasScopes(), "seccomp")},
        {"network", profile.network ? "allowed" : byLandlock(features.guardsTcp(), "seccomp")},
    };
    if (plan.container)
        made.set("container", *plan.container);
    if (plan.user)
        made.set("user", *plan.user);
    return made;
}

} // namespace

Dictionary describeConfinement(const ConfinementPlan& plan, const Profile& profile,
                               const KernelFeatures& features) {
    return {{"wanted", description(plan, profile, everything)},
            {"enforced", description(plan, profile, features)}};
}

} // namespace platform
