#pragma once

#include <optional>

#include "platform/ipc/Peer.h"

namespace platform::ipc {

// Who is at the other end of a connected socket: credentials, process descriptor and running file,
// all as of now. Nothing when the kernel does not tell the credentials. Waits for no file system.
// Any thread.
[[nodiscard]] std::optional<Peer> peerOf(int socket);

} // namespace platform::ipc
