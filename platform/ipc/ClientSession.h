#pragma once

#include <cstdint>
#include <deque>
#include <expected>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <variant>

#include "platform/file/File.h"
#include "platform/ipc/ClientConnection.h"
#include "platform/ipc/Frame.h"
#include "platform/ipc/Outbox.h"
#include "platform/ipc/SocketWatch.h"
#include "platform/value/Error.h"

namespace platform::ipc {

class Loop;

// Who waits for a reply; an empty handler when nobody does.
using PendingReply =
    std::variant<ClientConnection::ReplyHandler, ClientConnection::DescriptorHandler>;

[[nodiscard]] bool isWanted(const PendingReply& handler);

// Descriptors that came with the bytes of a stream, until their frame is complete. Each belongs to
// the last frame that had begun when it came, which the sender sees to. Keeps at most one for a
// frame. Owned by a session; used on its loop.
class DescriptorsOnTheWay {
public:
    // REQUIRES: in the order of `position`, which counts the stream's bytes up to the end of what
    // it came with.
    void add(std::uint64_t position, UniqueFd descriptor);
    // What belongs to the next frame, that ends there; may be empty.
    [[nodiscard]] UniqueFd take(std::uint64_t frameEnd);
    // To be called when all complete frames were taken.
    void keepFirst();

private:
    struct Arrived {
        std::uint64_t position;
        UniqueFd descriptor;
    };

    std::deque<Arrived> arrived_;
};

// One connection of a client to its daemon, from connect to the end. What is sent before the
// greeting came waits until it was answered, so that the daemon knows the client from its first
// request on.
//
// Shared by its ClientConnection and the loop's waits. `send` and `close` on any thread; reading
// and the rest of writing on the loop; handlers are called on the target queue.
class ClientSession final : public SocketWatch::Target,
                            public std::enable_shared_from_this<ClientSession> {
public:
    using EventHandler = ClientConnection::EventHandler;

    ClientSession(Loop& loop, std::shared_ptr<SerialQueue> target,
                  std::shared_ptr<EventHandler> events);

    // Begins to read. Called once, on any thread.
    void start(UniqueFd socket);

    // Sends a message; an empty handler makes it one-way. False when the session is over and
    // nothing was sent: the handler is then untouched.
    [[nodiscard]] bool send(const Dictionary& message, PendingReply& handler);
    // Ends the session; what is pending is answered with `error`.
    void close(ConnectionError error);

private:
    void readable() override;
    void writable() override;
    void takeFrames();
    [[nodiscard]] bool take(const Frame& frame);
    [[nodiscard]] bool answerGreeting(const Dictionary& greeting);
    void takeReply(std::uint64_t id, const Dictionary& body, UniqueFd descriptor);
    void writeRest();
    [[nodiscard]] bool takeBack(std::uint64_t id, PendingReply& handler);
    void lost();
    void tell(ClientConnection::Event event);

    Loop& loop_;
    const std::shared_ptr<SerialQueue> target_;
    const std::shared_ptr<EventHandler> events_;
    Outbox outbox_;

    // On the loop.
    std::unique_ptr<SocketWatch> socket_;
    FrameReader reader_{FrameReader::Side::client};
    bool greeted_ = false;
    std::uint64_t received_ = 0; // bytes
    std::uint64_t taken_ = 0;    // of them, in complete frames
    DescriptorsOnTheWay descriptors_;

    std::mutex mutex_;
    std::map<std::uint64_t, PendingReply> pending_; // guarded
    std::uint64_t lastId_ = 0;                      // guarded
    bool over_ = false;                             // guarded
};

// Calls a reply's handler on a queue.
void answer(SerialQueue& queue, PendingReply handler,
            std::expected<ClientConnection::ReplyWithDescriptor, ConnectionError> reply);

} // namespace platform::ipc
