#include "platform/confine/KernelFeatures.h"

#include <cstdint>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/confine/Landlock.h"

namespace platform {

namespace {

bool hasFilterAction(std::uint32_t action) {
    return ::syscall(SYS_seccomp, SECCOMP_GET_ACTION_AVAIL, 0U, &action) == 0;
}

KernelFeatures probe() {
    KernelFeatures features;
    features.noNewPrivileges = ::prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0) >= 0;
    features.systemCallFilters =
        hasFilterAction(SECCOMP_RET_ERRNO) && hasFilterAction(SECCOMP_RET_KILL_PROCESS);
    features.landlock = landlock::version();
    return features;
}

} // namespace

const KernelFeatures& KernelFeatures::ofThisSystem() {
    static const KernelFeatures features = probe();
    return features;
}

} // namespace platform
