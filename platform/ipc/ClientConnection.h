#pragma once

#include <expected>
#include <functional>
#include <memory>
#include <string>
#include <variant>

#include "platform/file/File.h"
#include "platform/ipc/Message.h"
#include "platform/value/Value.h"

namespace platform {
class SerialQueue;
}

namespace platform::ipc {

// A client's connection to a named service.
//
// Connects with the first send, and again with the next send after the daemon went away. Answers
// the daemon's greeting by itself. Replies and events are delivered on the target queue, in the
// order in which they came; the socket is served by one loop thread that all connections of the
// process share. Owned by whoever made it; may be used from any thread. Letting it go answers what
// is pending with the invalid error; so handlers may still be called then, on the queue.
class ClientConnection {
public:
    // The reply's body, or why there is none. Called exactly once.
    using ReplyHandler = std::move_only_function<void(std::expected<Dictionary, ConnectionError>)>;

    struct ReplyWithDescriptor {
        Dictionary body;
        UniqueFd descriptor; // that came with it (close-on-exec); may be empty
    };

    // The same for a reply that a descriptor may come with. One that comes with any other is
    // closed.
    using DescriptorHandler =
        std::move_only_function<void(std::expected<ReplyWithDescriptor, ConnectionError>)>;
    // An error, or a message of the daemon's own accord.
    using Event = std::variant<ConnectionError, Value>;
    using EventHandler = std::move_only_function<void(Event)>;

    ClientConnection(std::string socketPath, std::shared_ptr<SerialQueue> target);
    ClientConnection(const ClientConnection&) = delete;
    ClientConnection& operator=(const ClientConnection&) = delete;
    ~ClientConnection();

    // REQUIRES: before `resume`.
    void setEventHandler(EventHandler handler);
    // What was sent before goes out now. Called once.
    void resume();

    void send(const Dictionary& message);
    // Of several replies the first goes to `reply`. Without one: interrupted when the daemon went
    // away, invalid when it cannot be reached.
    void sendWithReply(const Dictionary& message, ReplyHandler reply);
    void sendForDescriptor(const Dictionary& message, DescriptorHandler reply);

    // Closes for good: what is pending, and every later send, is answered with invalid.
    void cancel();

    // "<connection to /run/...>", for log lines.
    [[nodiscard]] std::string describe() const;

private:
    struct Impl;
    std::shared_ptr<Impl> impl_;
};

[[nodiscard]] inline std::string describe(const ClientConnection& connection) {
    return connection.describe();
}

} // namespace platform::ipc
