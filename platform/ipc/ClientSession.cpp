#include "platform/ipc/ClientSession.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <sys/socket.h>
#include <utility>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/FrameText.h"
#include "platform/ipc/IpcLog.h"
#include "platform/ipc/Loop.h"
#include "platform/queue/SerialQueue.h"

namespace platform::ipc {

namespace {

constexpr std::size_t scratchSize = 256UL << 10;

char* scratch() {
    thread_local const std::unique_ptr<char[]> memory(new char[scratchSize]);
    return memory.get();
}

using Received = std::expected<ClientConnection::ReplyWithDescriptor, ConnectionError>;

void call(ClientConnection::ReplyHandler& handler, Received reply) {
    if (reply)
        handler(std::move(reply->body));
    else
        handler(std::unexpected(reply.error()));
}

void call(ClientConnection::DescriptorHandler& handler, Received reply) {
    handler(std::move(reply));
}

// There is room for one at a time, as many as a reply has; the kernel closes what is more.
using Control = std::array<char, CMSG_SPACE(sizeof(int))>;

UniqueFd descriptorIn(msghdr& message) {
    UniqueFd descriptor;
    for (cmsghdr* c = CMSG_FIRSTHDR(&message); c; c = CMSG_NXTHDR(&message, c)) {
        if (c->cmsg_level != SOL_SOCKET || c->cmsg_type != SCM_RIGHTS)
            continue;
        int number = -1;
        std::memcpy(&number, CMSG_DATA(c), sizeof(number));
        descriptor.reset(number);
    }
    return descriptor;
}

} // namespace

bool isWanted(const PendingReply& handler) {
    return std::visit([](const auto& one) { return static_cast<bool>(one); }, handler);
}

void answer(SerialQueue& queue, PendingReply handler, Received reply) {
    queue.async([handler = std::move(handler), reply = std::move(reply)]() mutable {
        std::visit([&](auto& one) { call(one, std::move(reply)); }, handler);
    });
}

void DescriptorsOnTheWay::add(std::uint64_t position, UniqueFd descriptor) {
    arrived_.push_back({position, std::move(descriptor)});
}

UniqueFd DescriptorsOnTheWay::take(std::uint64_t frameEnd) {
    UniqueFd first;
    for (; !arrived_.empty() && arrived_.front().position <= frameEnd; arrived_.pop_front()) {
        if (!first)
            first = std::move(arrived_.front().descriptor);
    }
    return first;
}

void DescriptorsOnTheWay::keepFirst() {
    while (arrived_.size() > 1)
        arrived_.pop_back();
}

ClientSession::ClientSession(Loop& loop, std::shared_ptr<SerialQueue> target,
                             std::shared_ptr<EventHandler> events)
    : loop_(loop), target_(std::move(target)), events_(std::move(events)) {}

void ClientSession::start(UniqueFd socket) {
    loop_.post([self = shared_from_this(), socket = std::move(socket)]() mutable {
        self->socket_ = std::make_unique<SocketWatch>(self->loop_, std::move(socket));
        self->socket_->waitReadable(self);
    });
}

bool ClientSession::send(const Dictionary& message, PendingReply& handler) {
    const FrameKind kind = isWanted(handler) ? FrameKind::request : FrameKind::oneWay;
    std::uint64_t id = 0;
    {
        const std::lock_guard lock(mutex_);
        if (over_)
            return false;
        id = ++lastId_;
        if (kind == FrameKind::request)
            pending_.emplace(id, std::exchange(handler, {}));
    }
    const FrameText frame(kind, id, message);
    if (!frame.fits(largestRequestBody)) {
        ipcLog().error("a request is past the limits of the wire: %{public}lu bytes",
                       frame.bodySize());
        PendingReply refused;
        if (kind == FrameKind::request && takeBack(id, refused))
            answer(*target_, std::move(refused), std::unexpected(ConnectionError::invalid));
        return true;
    }
    const Outbox::Outcome outcome = outbox_.send(frame.text(), frame.encoder());
    if (outcome == Outbox::Outcome::waiting)
        loop_.post([self = shared_from_this()] { self->writeRest(); });
    if (outcome != Outbox::Outcome::broken)
        return true;
    const bool untouched = kind == FrameKind::oneWay || takeBack(id, handler);
    close(ConnectionError::interrupted);
    return !untouched;
}

// False when someone answered already.
bool ClientSession::takeBack(std::uint64_t id, PendingReply& handler) {
    const std::lock_guard lock(mutex_);
    const auto place = pending_.find(id);
    if (place == pending_.end())
        return false;
    handler = std::move(place->second);
    pending_.erase(place);
    return true;
}

void ClientSession::readable() {
    if (!socket_)
        return;
    auto room = reader_.room(scratch(), scratchSize);
    msghdr message{};
    const bool held = room[0].iov_len != 0;
    message.msg_iov = room.data() + (held ? 0 : 1);
    message.msg_iovlen = held ? 2 : 1;
    alignas(cmsghdr) Control control{};
    message.msg_control = control.data();
    message.msg_controllen = CMSG_LEN(sizeof(int));
    const ssize_t count =
        ::recvmsg(socket_->descriptor(), &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    if (count < 0 && (errno == EAGAIN || errno == EINTR))
        return socket_->waitReadable(shared_from_this());
    if (count <= 0)
        return lost();
    reader_.filled(static_cast<std::size_t>(count));
    received_ += static_cast<std::size_t>(count);
    if (UniqueFd descriptor = descriptorIn(message))
        descriptors_.add(received_, std::move(descriptor));
    takeFrames();
}

void ClientSession::takeFrames() {
    for (;;) {
        const auto frame = reader_.next();
        if (!frame || (*frame && !take(**frame))) {
            ipcLog().error("the daemon sent a malformed frame");
            return lost();
        }
        if (!*frame)
            break;
    }
    reader_.keep();
    descriptors_.keepFirst();
    if (socket_)
        socket_->waitReadable(shared_from_this());
}

bool ClientSession::take(const Frame& frame) {
    taken_ += frameHeaderSize + frame.body.size();
    UniqueFd descriptor = descriptors_.take(taken_);
    const auto value = decode(frame.body, {.allowEncoded = true});
    const Dictionary* body = value ? value->dictionary() : nullptr;
    if (!body)
        return false;
    if (frame.header.kind == FrameKind::greeting)
        return answerGreeting(*body);
    if (frame.header.kind == FrameKind::reply)
        takeReply(frame.header.messageId, *body, std::move(descriptor));
    else
        tell(*value);
    return true;
}

bool ClientSession::answerGreeting(const Dictionary& greeting) {
    if (!socket_ || std::exchange(greeted_, true))
        return false;
    // On a new socket there is room for so little.
    Outbox first;
    first.open(socket_->descriptor());
    const FrameText frame(FrameKind::greetingAnswer, 0, greeting);
    if (first.send(frame.text(), frame.encoder()) != Outbox::Outcome::done)
        return false;
    outbox_.open(socket_->descriptor());
    writable();
    return true;
}

void ClientSession::takeReply(std::uint64_t id, const Dictionary& body, UniqueFd descriptor) {
    PendingReply handler;
    if (takeBack(id, handler))
        answer(*target_, std::move(handler),
               ClientConnection::ReplyWithDescriptor{body, std::move(descriptor)});
}

void ClientSession::writeRest() {
    if (socket_ && greeted_ && !outbox_.empty())
        socket_->waitWritable(shared_from_this());
}

void ClientSession::writable() {
    if (!socket_)
        return;
    switch (outbox_.flush()) {
    case Outbox::Outcome::waiting:
        return socket_->waitWritable(shared_from_this());
    case Outbox::Outcome::broken:
    case Outbox::Outcome::done:
        return; // reading finds the end
    }
}

void ClientSession::lost() {
    close(ConnectionError::interrupted);
}

void ClientSession::close(ConnectionError error) {
    std::map<std::uint64_t, PendingReply> unanswered;
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(over_, true))
            return;
        unanswered.swap(pending_);
    }
    outbox_.close();
    tell(error);
    for (auto& [id, handler] : unanswered)
        answer(*target_, std::move(handler), std::unexpected(error));
    loop_.post([self = shared_from_this()] { self->socket_.reset(); });
}

void ClientSession::tell(ClientConnection::Event event) {
    target_->async([events = events_, event = std::move(event)]() mutable {
        if (*events)
            (*events)(std::move(event));
    });
}

} // namespace platform::ipc
