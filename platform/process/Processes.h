#pragma once

#include <cstddef>
#include <expected>
#include <string>

#include "platform/ipc/Peer.h"

namespace platform {

// What the kernel tells of other processes. One interface, handed to the server; any thread.
class Processes {
public:
    virtual ~Processes() = default;

    // The path of the file that a peer ran when it connected, when it fits a buffer of `room` bytes
    // (its closing NUL included) and leads, in our own mounts, to that very file. On failure the
    // errno value. Waits for no file system that a stranger could have put there.
    [[nodiscard]] virtual std::expected<std::string, int> executablePath(const ipc::Peer& peer,
                                                                         std::size_t room) = 0;
};

} // namespace platform
