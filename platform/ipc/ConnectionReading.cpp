#include <cerrno>
#include <fcntl.h>
#include <sys/socket.h>
#include <utility>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/IpcLog.h"
#include "platform/ipc/SocketCalls.h"
#include "platform/ipc/WaitBreaker.h"

namespace platform::ipc {

namespace {

constexpr std::size_t scratchSize = 64UL << 10;

// A frame of at most this size is read whatever else waits.
constexpr std::size_t freePartial = scratchSize;

// Memory that all reading of a thread goes through.
char* scratch() {
    thread_local const std::unique_ptr<char[]> memory(new char[scratchSize]);
    return memory.get();
}

// Whether what was read was written by the process `pid`.
bool cameFrom(pid_t pid, msghdr& message) {
    for (cmsghdr* c = CMSG_FIRSTHDR(&message); c; c = CMSG_NXTHDR(&message, c)) {
        if (c->cmsg_level != SOL_SOCKET || c->cmsg_type != SCM_CREDENTIALS)
            continue;
        ucred writer{};
        __builtin_memcpy(&writer, CMSG_DATA(c), sizeof(writer));
        return writer.pid == pid && pid != 0;
    }
    return false;
}

// What one read brought.
struct Arrived {
    ssize_t count;
    bool fromPeer;
    bool plain; // nothing came along that ends a read before the socket is empty
};

// Reads once. Descriptors that a client sends along find no room and are closed by the kernel.
Arrived readOnce(int socket, std::array<iovec, 2> room, pid_t pid) {
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control{};
    msghdr message{};
    const bool held = room[0].iov_len != 0;
    message.msg_iov = room.data() + (held ? 0 : 1);
    message.msg_iovlen = held ? 2 : 1;
    message.msg_control = control.data();
    message.msg_controllen = CMSG_LEN(sizeof(ucred));
    if (isWaitBreakerNeeded())
        breakWaits();
    const ssize_t count = receiveMessage(socket, message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    const bool fromPeer = count > 0 && cameFrom(pid, message);
    return {count, fromPeer, fromPeer && !(message.msg_flags & MSG_CTRUNC)};
}

std::size_t sizeOf(const std::array<iovec, 2>& room) {
    return room[0].iov_len + room[1].iov_len;
}

} // namespace

void Connection::Impl::readable() {
    if (ended || !socket)
        return;
    const std::array<iovec, 2> room = reader.room(scratch(), scratchSize);
    const Arrived arrived = readOnce(socket->descriptor(), room, peer.pid);
    if (arrived.count < 0 && (errno == EAGAIN || errno == EINTR)) {
        left = errno == EAGAIN ? SocketWatch::Left::nothing : SocketWatch::Left::unknown;
        return socket->waitReadable(target(), left);
    }
    if (arrived.count <= 0)
        return end(Replies::flush);
    const auto count = static_cast<std::size_t>(arrived.count);
    mixed = mixed || !arrived.plain;
    left =
        mixed || count == sizeOf(room) ? SocketWatch::Left::unknown : SocketWatch::Left::unlikely;
    reader.filled(count, arrived.fromPeer);
    takeFrames();
}

// Takes up what has come as far as the limits allow, hands some of it out, and then reads on, comes
// back to what is left, or pauses.
void Connection::Impl::takeFrames() {
    bool took = false;
    bool emptied = false;
    while (!emptied && hasRoom()) {
        const auto frame = reader.next();
        if (!frame)
            return end(Replies::drop, frame.error());
        if (!*frame) {
            emptied = true;
        } else if (const auto complaint = take(**frame)) {
            return end(Replies::drop, *complaint);
        } else {
            took = true;
        }
    }
    reader.keep();
    if (took && !turnDue) // else its turn comes
        takeTurn();
    if (ended || !socket)
        return;
    const bool admitted = admitBegun();
    if (pauseUnless(admitted))
        pause(admitted);
    else if (emptied)
        socket->waitReadable(target(), left);
    else
        comeBack(); // requests were done meanwhile; no new byte may ever come
}

// No wait on the socket keeps the connection until then; this does.
void Connection::Impl::comeBack() {
    loop.post([connection = owner->shared_from_this()] { connection->impl().goOn(); });
}

// Answers with what is malformed about the frame. Whoever writes within a frame of the peer's moves
// the place where the next one begins: from then on, what looks like a frame of the peer's may be
// anything that it sends.
Connection::Impl::Complaint Connection::Impl::take(const Frame& frame) {
    if (frame.isMixed) {
        entangled = true;
        greeted = false;
    }
    return frame.header.kind == FrameKind::greetingAnswer ? takeAnswer(frame) : takeRequest(frame);
}

Connection::Impl::Complaint Connection::Impl::takeRequest(const Frame& frame) {
    auto decoded = decodeCounted(frame.body, {.maxValues = mostRequestValues});
    if (!decoded)
        return decoded.error().description;
    const Dictionary* body = decoded->value.dictionary();
    if (!body)
        return "a body that is not a map";
    Message message;
    message.body = *body;
    message.id = frame.header.messageId;
    message.expectsReply = frame.header.kind == FrameKind::request;
    message.fromPeer = frame.fromPeer;
    message.greeted = greeted;
    decoded->value = Value();
    releaseReserved();
    enqueue(std::move(message), frameHeaderSize + frame.body.size() + decoded->values * valueCost);
    return std::nullopt;
}

Connection::Impl::Complaint Connection::Impl::takeAnswer(const Frame& frame) {
    if (std::exchange(answered, true))
        return "a second answer to the greeting";
    const auto body = decode(frame.body);
    const Dictionary* map = body ? body->dictionary() : nullptr;
    const Value* value = map && map->size() == 1 ? map->find("challenge") : nullptr;
    const Data* data = value ? value->data() : nullptr;
    if (!data || data->bytes != challenge)
        return "a wrong answer to the greeting";
    greeted = frame.fromPeer && !entangled;
    return std::nullopt;
}

// A large request is read on only when there is room for all of it: what was begun can always be
// completed, so that large requests never wait for each other.
bool Connection::Impl::admitBegun() {
    const std::size_t begun = reader.begunFrame();
    if (begun <= freePartial || reserved != 0)
        return true;
    if (!account->reserve(begun))
        return false;
    reserved = begun;
    return true;
}

void Connection::Impl::releaseReserved() {
    if (reserved != 0)
        account->release(std::exchange(reserved, 0));
}

bool Connection::Impl::hasRoom() const {
    return unfinished < limits.waitingRequests && unfinishedCost < limits.waitingBytes &&
           (unfinished == 0 || !account->full());
}

bool Connection::Impl::pauseUnless(bool admitted) {
    if (admitted && !paused && hasRoom())
        return false;
    const std::lock_guard lock(mutex);
    paused = !admitted || !hasRoom();
    return paused;
}

// While nothing is read, only the socket's hang-up and the end of the process tell that the client
// is gone.
void Connection::Impl::pause(bool admitted) {
    socket->waitHangUp(target());
    if (peer.process && !process) {
        UniqueFd copy(::fcntl(peer.process.get(), F_DUPFD_CLOEXEC, 0));
        if (copy) {
            process = loop.watchDescriptor(std::move(copy), [connection = owner->weak_from_this()] {
                if (const auto there = connection.lock())
                    there->impl().hungUp();
            });
        }
    }
    if ((admitted && !account->full()) || std::exchange(awaitsUser, true))
        return;
    const std::size_t awaited = admitted ? 1 : reader.begunFrame();
    account->whenFits(awaited, [connection = owner->weak_from_this()] {
        if (const auto there = connection.lock())
            there->impl().post(&Impl::userHasRoom);
    });
}

void Connection::Impl::userHasRoom() {
    awaitsUser = false;
    goOn();
}

void Connection::Impl::goOn() {
    {
        const std::lock_guard lock(mutex);
        if (ended)
            return;
        paused = false;
    }
    process.reset();
    takeFrames();
}

void Connection::Impl::hungUp() {
    {
        const std::lock_guard lock(mutex);
        if (!paused && !ended)
            return; // reading finds the end in its turn
    }
    if (ended)
        close();
    else
        end(Replies::drop);
}

} // namespace platform::ipc
