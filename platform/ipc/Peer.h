#pragma once

#include <sys/types.h>

#include "platform/file/File.h"

namespace platform::ipc {

// Who connected, as the kernel told when the connection was accepted. Never changes; shared by the
// connection and by whoever works for its client, also after the connection's end.
struct Peer {
    pid_t pid = 0; // 0 for a process that this one cannot see
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
    // The process itself (pidfd), which keeps a reused pid from being taken for it; may be empty.
    UniqueFd process;
    // The running file (O_PATH), opened before the greeting was sent. Empty when nothing may be
    // concluded from the file: the process is gone, or lives in another user or pid namespace, or
    // the file is none that this process may read.
    UniqueFd executable;
};

// Whether the process has not ended. What was learnt by its pid before is then about it, and about
// no later process of the same pid. Any thread.
[[nodiscard]] bool isAlive(const Peer& peer);

// Whether it is alive and still runs the file that it ran when it connected. False also for a peer
// without executable. Any thread.
[[nodiscard]] bool runsItsExecutable(const Peer& peer);

} // namespace platform::ipc
