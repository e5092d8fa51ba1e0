#pragma once

#include <sys/types.h>

#include "platform/file/File.h"

namespace platform::ipc {

// Who connected, as the kernel told when the connection was accepted. Owned by the connection;
// never changes. The process descriptor keeps a reused pid from being taken for the client.
struct Peer {
    pid_t pid = 0;
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
    UniqueFd process; // pidfd; may be empty
    UniqueFd
        executable; // the running file, opened (O_PATH) before the greeting was sent; may be empty
};

} // namespace platform::ipc
