#pragma once

#include <fcntl.h>
#include <string>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/ipc/Peer.h"

// A process as if it had connected, and runs a file that tells who it is.
inline platform::ipc::Peer peerOfProcess(pid_t pid) {
    platform::ipc::Peer peer;
    peer.pid = pid;
    peer.process.reset(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0)));
    peer.executable.reset(
        ::open(("/proc/" + std::to_string(pid) + "/exe").c_str(), O_PATH | O_CLOEXEC));
    return peer;
}
