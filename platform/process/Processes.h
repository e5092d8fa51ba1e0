#pragma once

#include <cstddef>
#include <expected>
#include <string>
#include <sys/types.h>

namespace platform {

// What the kernel tells of other processes. One interface, handed to the server; any thread.
class Processes {
public:
    virtual ~Processes() = default;

    // The executable path of a process, when it fits a buffer of `room` bytes (its closing NUL
    // included) and leads, in our own mounts, to the very file that runs. On failure the errno
    // value.
    [[nodiscard]] virtual std::expected<std::string, int> executablePath(pid_t pid,
                                                                         std::size_t room) = 0;
};

} // namespace platform
