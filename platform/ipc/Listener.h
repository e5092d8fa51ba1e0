#pragma once

#include <cstddef>
#include <expected>
#include <functional>
#include <memory>
#include <string>
#include <variant>

#include "platform/ipc/Limits.h"
#include "platform/ipc/Message.h"
#include "platform/value/Error.h"

namespace platform::ipc {

class Connection;
class Loop;

inline constexpr std::size_t longestSocketPath = 107;

// What a listener's handler gets: a new peer (to be given its handler and resumed within the call,
// or it is closed), what happened to the listener, or anything else.
using ListenerEvent = std::variant<std::shared_ptr<Connection>, ConnectionError, Value>;

// A named service: a listening socket at a path, which every local user may connect to. A lock file
// beside the socket tells whether a daemon serves the name; a socket that nobody serves is
// replaced.
//
// Owned by the server; its handler runs on the loop, which must outlive it. It keeps the
// connections that it accepted until they end, also when it is gone itself.
class Listener {
public:
    using Handler = std::move_only_function<void(ListenerEvent)>;

    // Binds the path: clients can connect, and wait to be accepted. Fails when another daemon
    // serves it, when the path is too long for a socket, and when the system refuses.
    [[nodiscard]] static std::expected<std::unique_ptr<Listener>, Error>
    create(Loop& loop, const std::string& path, Handler handler, const Limits& limits = {});
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;
    ~Listener(); // cancels

    // Replaces the handler. REQUIRES: before `resume`.
    void setEventHandler(Handler handler);
    // Begins to accept. Any thread.
    void resume();
    // Stops accepting and removes the socket before it returns; connections live on. The handler
    // gets the invalid event, as its last one. Any thread.
    void cancel();

    [[nodiscard]] const std::string& path() const noexcept;

private:
    struct Impl;
    explicit Listener(std::shared_ptr<Impl> impl);

    std::shared_ptr<Impl> impl_;
};

} // namespace platform::ipc
