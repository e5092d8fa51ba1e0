#include "platform/confine/PreparedConfinement.h"

#include <cerrno>
#include <linux/capability.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/confine/ConfinementDescription.h"
#include "platform/confine/FileRules.h"
#include "platform/confine/Landlock.h"
#include "platform/confine/Profile.h"

namespace platform {

namespace {

std::expected<UniqueFd, Error> makeRules(const ConfinementPlan& plan, const Profile& profile,
                                         const KernelFeatures& features) {
    if (!features.guardsFiles())
        return UniqueFd();
    auto rules = landlock::makeRuleset(features, !profile.network);
    if (!rules)
        return rules;
    if (auto error = addFileRules(rules->get(), plan, profile, features))
        return std::unexpected(std::move(*error));
    return rules;
}

// Also root's: without them it is a user like others, and no_new_privs keeps it so.
int dropCapabilities() noexcept {
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    const __user_cap_data_struct none[_LINUX_CAPABILITY_U32S_3]{};
    return ::syscall(SYS_capset, &header, none) == 0 ? 0 : errno;
}

} // namespace

PreparedConfinement::PreparedConfinement(CallFilter::Ptr filter, UniqueFd rules,
                                         Dictionary description)
    : filter_(std::move(filter)), rules_(std::move(rules)), description_(std::move(description)) {}

std::expected<PreparedConfinement, Error>
PreparedConfinement::prepare(const ConfinementPlan& plan, const KernelFeatures& features) {
    const Profile* profile = findProfile(plan.profile);
    if (!profile)
        return std::unexpected(posixError(EINVAL, "sandbox profile " + plan.profile));
    if (!features.noNewPrivileges || !features.systemCallFilters)
        return std::unexpected(posixError(ENOSYS, "no_new_privs and seccomp filters"));
    auto filter = CallFilter::of({.network = profile->network,
                                  .ownUser = plan.user.has_value(),
                                  .guardedTruncation = features.guardsTruncation(),
                                  .guardedSignals = features.hasScopes()});
    if (!filter)
        return std::unexpected(std::move(filter.error()));
    auto rules = makeRules(plan, *profile, features);
    if (!rules)
        return std::unexpected(std::move(rules.error()));
    return PreparedConfinement(std::move(*filter), std::move(*rules),
                               describeConfinement(plan, *profile, features));
}

int PreparedConfinement::enforce() const noexcept {
    if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0)
        return errno;
    if (const int failed = dropCapabilities())
        return failed;
    if (rules_) {
        addOwnProcess(rules_.get());
        if (const int failed = landlock::restrictSelf(rules_.get()))
            return failed;
    }
    return filter_->install();
}

} // namespace platform
