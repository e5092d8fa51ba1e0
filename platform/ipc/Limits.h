#pragma once

#include <chrono>
#include <cstddef>

namespace platform::ipc {

// What a service lets its clients have. Beyond what may wait, it reads no further until some of
// that is done.
struct Limits {
    std::size_t waitingRequests = 256;         // of a connection
    std::size_t waitingBytes = 16U << 20;      // of a connection; memory of the values included
    std::size_t userWaitingBytes = 64U << 20;  // of all connections of a user id
    std::size_t userConnections = 1024;        // or what a quarter of the descriptors allows
    int room = 0;                              // bytes of a socket for replies; 0: as usual
    std::chrono::milliseconds stalled{30'000}; // without progress of what is to be written
};

// What a decoded value takes in memory, at least: counted besides the bytes of its request.
inline constexpr std::size_t valueCost = 32;

} // namespace platform::ipc
