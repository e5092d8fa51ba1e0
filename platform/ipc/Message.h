#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <variant>

#include "platform/file/File.h"
#include "platform/value/Value.h"

namespace platform::ipc {

class Connection;

// What can happen to a connection or listener besides messages. Values of their own kind, never on
// the wire.
enum class ConnectionError : std::uint8_t {
    interrupted,         // the daemon went away; the next send connects again (client side)
    invalid,             // the peer is gone for good; or there is nobody at the service's name
    terminationImminent, // this process was asked to end
};

// One line for people; also the description that clients see.
[[nodiscard]] std::string describe(ConnectionError error);

// The place that a taken-up request holds in its connection. While it lives, the request counts
// against what the connection and its user may have waiting. The connection hands out its next
// request only once this one was taken. Movable; owned by the request's message, or by whoever
// works on the request. Any thread.
class Ticket {
public:
    Ticket() = default;
    Ticket(std::shared_ptr<Connection> connection, std::size_t cost);
    Ticket(Ticket&& other) noexcept;
    Ticket& operator=(Ticket&& other) noexcept;
    ~Ticket(); // taken, if it was not

    // The request is off the queue: the connection may hand out its next one, and does so right
    // here, on the calling thread. Called when the request's handler has returned.
    void taken();
    // The same, but the next one is handed out on the connection's loop.
    void takenOnLoop();

private:
    void finish();

    std::shared_ptr<Connection> connection_;
    std::size_t cost_ = 0;
    bool taken_ = false;
};

// A request as it came off the wire.
struct Message {
    Dictionary body;
    std::uint64_t id = 0;
    bool expectsReply = true;
    // Every byte of it was written by the very process that connected.
    bool fromPeer = true;
    // The client had answered the greeting before it sent this.
    bool greeted = false;
    Ticket ticket;
};

// What is sent back. May be sent any number of times; the reply to a one-way message goes nowhere.
struct Reply {
    Dictionary body;
    std::uint64_t messageId = 0;
    bool expected = true;
    // Goes to the client along with the body; the sender keeps its own, if it wants.
    std::shared_ptr<const UniqueFd> descriptor = {};
};

[[nodiscard]] inline Reply createReply(const Message& request) {
    return {.messageId = request.id, .expected = request.expectsReply};
}

// What a connection's handler gets; the last one is a message that is not a request.
using Event = std::variant<Message, ConnectionError, Value>;

} // namespace platform::ipc
