#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/ipc/Message.h"
#include "platform/ipc/Peer.h"

namespace platform::ipc {

// The daemon's end of one client's connection.
//
// Made by the listener, which keeps it until it ends; others hold it weakly, or shared for as long
// as they have something to send. Reading and the end of the connection happen on the loop.
// Requests go to the event handler one at a time: the next one when the ticket of the last was
// taken (on the thread that took it) and no reply waits to be written; so a client that floods gets
// no more of the service queue than any other. The handler is never called twice at once. The
// invalid event comes on the loop, once, as the last one; then the handler is let go.
//
// Sending may be done from any thread: a reply is written at once as far as the socket takes it,
// and the loop writes the rest.
class Connection : public std::enable_shared_from_this<Connection> {
public:
    using EventHandler = std::move_only_function<void(Event)>;

    struct Impl;
    explicit Connection(std::unique_ptr<Impl> impl); // for the listener
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;
    ~Connection();

    [[nodiscard]] const std::shared_ptr<const Peer>& peer() const noexcept;
    // The peer's process id, 0 once the connection is gone.
    [[nodiscard]] pid_t pid() const noexcept;
    // False once the connection is gone.
    [[nodiscard]] bool isAlive() const noexcept;
    // "<connection 17 pid=4242 uid=0>", for log lines.
    [[nodiscard]] std::string describe() const;

    // REQUIRES: before `resume`.
    void setEventHandler(EventHandler handler);
    // Begins to deliver events. Called once.
    void resume();
    // Writes a reply. A reply past the wire's limits is replaced by a short error.
    void send(const Reply& reply);
    // Ends the connection as if the peer had gone.
    void cancel();

    [[nodiscard]] Impl& impl() noexcept { return *impl_; }

private:
    std::unique_ptr<Impl> impl_;
};

[[nodiscard]] inline std::string describe(const Connection& connection) {
    return connection.describe();
}

} // namespace platform::ipc
