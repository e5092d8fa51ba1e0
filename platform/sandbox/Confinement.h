#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>

#include "platform/ipc/Peer.h"

namespace platform {

// How confined a process is, as far as the kernel tells.
struct Confinement {
    unsigned long seccompFilters = 0;
    std::string userNamespace;  // as its link in /proc names it
    std::string mountNamespace; // likewise

    // Nothing when the process is gone or may not be looked at.
    [[nodiscard]] static std::optional<Confinement> of(pid_t pid);
};

// The number of filters by the text of /proc/PID/status; 1 where an old kernel only tells that
// there are some.
[[nodiscard]] unsigned long seccompFiltersIn(std::string_view status);

// True when `process` is more confined than `self`: more seccomp filters, another user namespace,
// or a mount namespace that is neither its own nor `first`'s (process 1, where it may be looked
// at).
[[nodiscard]] bool isMoreConfined(const Confinement& process, const Confinement& self,
                                  const std::optional<Confinement>& first);

// Whether a process surely has the same root folder as this one, and the same mounts or those of
// process 1. Any thread.
[[nodiscard]] bool seesOurFiles(const ipc::Peer& peer);

} // namespace platform
