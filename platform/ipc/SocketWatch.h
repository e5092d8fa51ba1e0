#pragma once

#include <cstdint>
#include <memory>

#include "platform/file/File.h"

namespace platform::ipc {

class Loop;

// A socket on a loop, and what its owner waits for. Each wait is for one event, and keeps the
// target alive until it came or the watch was closed. Owned by the target; used on the loop only.
class SocketWatch {
public:
    // Who is told. Calls come on the loop.
    class Target {
    public:
        virtual ~Target() = default;
        virtual void readable() = 0; // perhaps

        virtual void writable() {}

        virtual void hungUp() {} // the peer closed both directions
    };

    // What the last read may have left in the socket. It decides how much waiting costs: the kernel
    // tells of what comes from now on by itself; of what is there already it must be asked.
    enum class Left : std::uint8_t {
        unknown,  // the kernel is asked
        unlikely, // the target is told once more a moment later
        nothing,
    };

    // REQUIRES: on the loop, or the loop not running.
    SocketWatch(Loop& loop, UniqueFd socket);
    SocketWatch(const SocketWatch&) = delete;
    SocketWatch& operator=(const SocketWatch&) = delete;
    ~SocketWatch();

    // -1 once closed, and when the system could not watch it.
    [[nodiscard]] int descriptor() const noexcept;

    // Nothing happens when the wait is under way already.
    void waitReadable(std::shared_ptr<Target> target, Left left = Left::unknown);
    void waitWritable(std::shared_ptr<Target> target);
    void waitHangUp(std::shared_ptr<Target> target);
    // Ends all waits and closes the socket.
    void close();

    struct State;

private:
    std::shared_ptr<State> state_;
};

} // namespace platform::ipc
