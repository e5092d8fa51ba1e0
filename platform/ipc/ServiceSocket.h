#pragma once

#include <cstddef>
#include <expected>
#include <string>

#include "platform/file/File.h"
#include "platform/value/Error.h"

namespace platform::ipc {

// A listening socket at a service's path, and the lock that makes it ours. Owned by a listener,
// which accepts on it; letting it go removes the socket from the path. Any thread.
class ServiceSocket {
public:
    // Takes the lock beside the path (so that no other daemon serves it), and replaces a socket
    // that was left there by a new one, 0666 in a folder 0755. Clients can connect as soon as it is
    // there; they wait until somebody accepts.
    [[nodiscard]] static std::expected<ServiceSocket, Error> bind(const std::string& path);
    ServiceSocket(ServiceSocket&&) = default;
    ServiceSocket& operator=(ServiceSocket&&) = delete;
    ~ServiceSocket();

    // The socket, for whoever accepts on it. The path stays ours.
    [[nodiscard]] UniqueFd takeSocket() { return std::move(socket_); }

private:
    ServiceSocket(std::string path, UniqueFd lock, UniqueFd socket)
        : path_(std::move(path)), lock_(std::move(lock)), socket_(std::move(socket)) {}

    std::string path_;
    UniqueFd lock_; // empty once moved from
    UniqueFd socket_;
};

// A socket connected to the service at a path.
[[nodiscard]] std::expected<UniqueFd, Error> connectToService(const std::string& path);

// Has a socket, and those that it accepts, refuse descriptors. False when the kernel cannot do
// that.
bool takeNoDescriptors(int socket) noexcept;

} // namespace platform::ipc
