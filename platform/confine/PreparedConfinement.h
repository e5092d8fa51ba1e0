#pragma once

#include <expected>

#include "platform/confine/ConfinementPlan.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// A confinement, all prepared: what needs memory or can fail for want of it was done before the
// process is made. Owned by the launcher.
class PreparedConfinement {
public:
    // Fails for an unknown profile, and where the kernel lacks what no plug-in may run without
    // (no_new_privs, seccomp filters). What else it lacks is left out, and told.
    [[nodiscard]] static std::expected<PreparedConfinement, Error>
    prepare(const ConfinementPlan& plan);

    // Confines the calling process for good. Between fork and exec; calls nothing that is not
    // async-signal-safe. 0, or an errno value: then the process must not go on.
    [[nodiscard]] int enforce() const noexcept;

    // "wanted" and "enforced": for each a dictionary of what it is made of.
    [[nodiscard]] Dictionary describe() const;
};

// Whether processes of the profile may connect to the daemon's own services.
[[nodiscard]] bool profileMayReachDaemon(std::string_view profile);

} // namespace platform
