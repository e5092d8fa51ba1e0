#pragma once

#include <expected>
#include <string_view>

#include "platform/confine/CallFilter.h"
#include "platform/confine/ConfinementPlan.h"
#include "platform/confine/KernelFeatures.h"
#include "platform/file/File.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// A confinement for one process, all prepared: what needs memory or can fail for want of it was
// done before the process is made. Owned by the launcher, which keeps its descriptor (it closes on
// exec) open in the new process until `enforce` was called. One thread at a time.
class PreparedConfinement {
public:
    // Fails for an unknown profile, a bundle or container that is not there, and where the kernel
    // lacks what no plug-in may run without (no_new_privs, seccomp filters). What else it lacks is
    // left out, and told.
    [[nodiscard]] static std::expected<PreparedConfinement, Error>
    prepare(const ConfinementPlan& plan,
            const KernelFeatures& features = KernelFeatures::ofThisSystem());

    // Confines the calling process for good; it has its user id already. Between fork and exec, by
    // the only thread; calls nothing that is not async-signal-safe. 0, or an errno value: then the
    // process must not go on.
    [[nodiscard]] int enforce() const noexcept;

    // "wanted" and "enforced": for each a dictionary of what it is made of. Both have the same
    // keys, and what differs is what the kernel lacks. docs/sandbox.md lists them.
    [[nodiscard]] Dictionary describe() const { return description_; }

private:
    PreparedConfinement(CallFilter::Ptr filter, UniqueFd rules, Dictionary description);

    CallFilter::Ptr filter_;
    UniqueFd rules_; // of Landlock; none where there is none
    Dictionary description_;
};

// Whether processes of the profile may connect to the daemon's own services.
[[nodiscard]] bool profileMayReachDaemon(std::string_view profile);

} // namespace platform
