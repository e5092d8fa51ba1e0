#include "platform/confine/Landlock.h"

#include <cerrno>
#include <sys/syscall.h>
#include <unistd.h>

namespace platform::landlock {

namespace {

constexpr std::uint32_t askVersion = 1U << 0;
constexpr int rulePathBeneath = 1;

// As the kernel has it; one that knows less takes it as long as the rest is zero.
struct RulesetAttributes {
    std::uint64_t handledFiles;
    std::uint64_t handledNetwork;
    std::uint64_t scoped;
};

struct [[gnu::packed]] PathBeneath {
    std::uint64_t allowed;
    std::int32_t parent;
};

} // namespace

Rights rightsToFiles(const KernelFeatures& features) {
    if (!features.guardsFiles())
        return 0;
    Rights rights = refer - 1; // all older ones
    if (features.guardsReferring())
        rights |= refer;
    if (features.guardsTruncation())
        rights |= truncate;
    if (features.guardsDeviceControls())
        rights |= controlDevice;
    return rights;
}

int version() {
    const long version = ::syscall(SYS_landlock_create_ruleset, nullptr, 0, askVersion);
    return version > 0 ? static_cast<int>(version) : 0;
}

std::expected<UniqueFd, Error> makeRuleset(const KernelFeatures& features, bool refusesNetwork) {
    RulesetAttributes attributes{rightsToFiles(features), 0, 0};
    if (refusesNetwork && features.guardsTcp())
        attributes.handledNetwork = bindTcp | connectTcp;
    if (features.hasScopes())
        attributes.scoped = scopeAbstractSockets | scopeSignals;
    const long made =
        ::syscall(SYS_landlock_create_ruleset, &attributes, sizeof attributes, std::uint32_t{0});
    if (made < 0)
        return std::unexpected(posixError(errno, "Landlock rules"));
    return UniqueFd(static_cast<int>(made));
}

int allowBelow(int ruleset, int path, Rights rights) noexcept {
    const PathBeneath rule{rights, path};
    if (::syscall(SYS_landlock_add_rule, ruleset, rulePathBeneath, &rule, std::uint32_t{0}) == 0)
        return 0;
    return errno;
}

int restrictSelf(int ruleset) noexcept {
    return ::syscall(SYS_landlock_restrict_self, ruleset, std::uint32_t{0}) == 0 ? 0 : errno;
}

} // namespace platform::landlock
