#pragma once

#include <expected>
#include <memory>
#include <vector>

#include "platform/value/Error.h"

struct sock_filter; // NOLINT(readability-identifier-naming): the kernel's

namespace platform {

// On what the system calls of a plug-in depend. A plain value.
struct CallFilterKind {
    bool network = false;          // TCP and UDP sockets
    bool ownUser = false;          // nobody else's files and processes have its user id
    bool guardedTruncation = true; // by Landlock; else by the filter
    bool guardedSignals = true;    // likewise

    friend auto operator<=>(const CallFilterKind&, const CallFilterKind&) = default;
};

// A seccomp filter, ready to be installed: what the calls allow is in CallRules.cpp. Unchanging and
// shared; any thread.
class CallFilter {
public:
    using Ptr = std::shared_ptr<const CallFilter>;

    // Made once for each kind; afterwards the same object.
    [[nodiscard]] static std::expected<Ptr, Error> of(const CallFilterKind& kind);

    explicit CallFilter(std::vector<sock_filter> program);
    ~CallFilter();

    // Installs it in the calling thread for good, which must have no_new_privs. Async-signal-safe;
    // an errno value, or 0.
    [[nodiscard]] int install() const noexcept;

private:
    const std::vector<sock_filter> program_;
};

} // namespace platform
