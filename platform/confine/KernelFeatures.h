#pragma once

namespace platform {

// What this kernel has to confine a process with. A plain value; a test makes its own to see what
// an older kernel would give.
struct KernelFeatures {
    bool noNewPrivileges = false;
    bool systemCallFilters = false;
    int landlock = 0; // its version; 0: there is none, or it was not switched on

    // Asked once of the running kernel. Any thread.
    [[nodiscard]] static const KernelFeatures& ofThisSystem();

    // Newer calls and rights came with these versions of Landlock.
    [[nodiscard]] bool guardsFiles() const noexcept { return landlock >= 1; }

    [[nodiscard]] bool guardsReferring() const noexcept { return landlock >= 2; }

    [[nodiscard]] bool guardsTruncation() const noexcept { return landlock >= 3; }

    [[nodiscard]] bool guardsTcp() const noexcept { return landlock >= 4; }

    [[nodiscard]] bool guardsDeviceControls() const noexcept { return landlock >= 5; }

    // Signals and abstract unix sockets.
    [[nodiscard]] bool hasScopes() const noexcept { return landlock >= 6; }
};

} // namespace platform
