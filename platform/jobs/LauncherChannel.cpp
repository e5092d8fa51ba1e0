#include "platform/jobs/LauncherChannel.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <sys/socket.h>
#include <utility>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/FrameText.h"

namespace platform::launcher {

namespace {

constexpr std::size_t scratchSize = 16UL << 10;
// Of one frame, and so of one write.
constexpr std::size_t mostDescriptors = 2;

using Control = std::array<char, CMSG_SPACE(sizeof(int) * mostDescriptors)>;

// Bytes that were written; -1 with errno.
ssize_t writeOnce(int socket, std::string_view bytes, const std::vector<UniqueFd>& descriptors) {
    iovec part{const_cast<char*>(bytes.data()), bytes.size()}; // sendmsg only reads
    msghdr message{};
    message.msg_iov = &part;
    message.msg_iovlen = 1;
    alignas(cmsghdr) Control control{};
    if (!descriptors.empty()) {
        const std::size_t size = sizeof(int) * descriptors.size();
        message.msg_control = control.data();
        message.msg_controllen = CMSG_SPACE(size);
        cmsghdr* const head = CMSG_FIRSTHDR(&message);
        *head = {CMSG_LEN(size), SOL_SOCKET, SCM_RIGHTS};
        unsigned char* to = CMSG_DATA(head);
        for (const UniqueFd& descriptor : descriptors) {
            const int number = descriptor.get();
            std::memcpy(to, &number, sizeof number);
            to += sizeof number;
        }
    }
    return ::sendmsg(socket, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
}

void takeDescriptors(msghdr& message, LauncherChannel::Descriptors& to) {
    for (cmsghdr* c = CMSG_FIRSTHDR(&message); c; c = CMSG_NXTHDR(&message, c)) {
        if (c->cmsg_level != SOL_SOCKET || c->cmsg_type != SCM_RIGHTS)
            continue;
        const std::size_t count = (c->cmsg_len - CMSG_LEN(0)) / sizeof(int);
        for (std::size_t i = 0; i < count; ++i) {
            int number = -1;
            std::memcpy(&number, CMSG_DATA(c) + i * sizeof number, sizeof number);
            to.emplace_back(number);
        }
    }
}

bool isForLater(int error) {
    return error == EAGAIN || error == EINTR;
}

} // namespace

LauncherChannel::LauncherChannel(ipc::Loop& loop, UniqueFd socket, Reading reading)
    : reading_(reading), socket_(loop, std::move(socket)) {}

void LauncherChannel::start(Handlers handlers) {
    handlers_ = std::move(handlers);
    waitForMore();
}

void LauncherChannel::close() {
    over_ = true;
    socket_.close();
    waiting_.clear();
    arrived_.clear();
}

bool LauncherChannel::mayRead() const {
    return !over_ && (reading_ == Reading::always || waiting_.empty());
}

void LauncherChannel::waitForMore() {
    if (mayRead())
        socket_.waitReadable(shared_from_this());
}

void LauncherChannel::readable() {
    if (mayRead() && !readOnce())
        waitForMore();
}

void LauncherChannel::finish() {
    while (!over_ && readOnce()) {}
    if (!over_)
        lose(nullptr);
}

// False when nothing was there.
bool LauncherChannel::readOnce() {
    std::array<char, scratchSize> scratch;
    auto room = reader_.room(scratch.data(), scratch.size());
    alignas(cmsghdr) Control control{};
    msghdr message{};
    const bool held = room[0].iov_len != 0;
    message.msg_iov = room.data() + (held ? 0 : 1);
    message.msg_iovlen = held ? 2 : 1;
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    const ssize_t count =
        ::recvmsg(socket_.descriptor(), &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    if (count < 0 && isForLater(errno))
        return false;
    if (count > 0)
        takeDescriptors(message, arrived_);
    if (count <= 0) // also where it ended without having read all
        lose(nullptr);
    else if (message.msg_flags & MSG_CTRUNC)
        lose("more descriptors than a message has");
    else {
        reader_.filled(static_cast<std::size_t>(count));
        takeFrames();
    }
    return true;
}

void LauncherChannel::takeFrames() {
    while (mayRead()) {
        const auto frame = reader_.next();
        if (!frame)
            return lose(frame.error());
        if (!*frame)
            break;
        if (!take(**frame))
            return lose("a message that means nothing");
    }
    if (over_)
        return;
    reader_.keep();
    // What came and belongs to no frame that is complete belongs to one that was begun.
    if (waiting_.empty() && arrived_.size() > mostDescriptors)
        return lose("descriptors without a message");
    waitForMore();
}

bool LauncherChannel::take(const ipc::Frame& frame) {
    if (frame.header.kind != ipc::FrameKind::oneWay)
        return false;
    const auto body = ipc::decodeCounted(frame.body, {.maxValues = ipc::mostRequestValues});
    const Dictionary* message = body ? body->value.dictionary() : nullptr;
    return message && handlers_.message(*message, arrived_);
}

bool LauncherChannel::send(const Dictionary& message, std::vector<UniqueFd> descriptors) {
    const ipc::FrameText frame(ipc::FrameKind::oneWay, 0, message);
    if (!frame.fits(ipc::largestRequestBody))
        return false;
    if (over_ || broken_)
        return true;
    const bool first = waiting_.empty();
    waiting_.push_back({std::string(frame.text()), 0, std::move(descriptors)});
    if (first)
        writeWaiting();
    return true;
}

void LauncherChannel::writable() {
    if (over_)
        return;
    writeWaiting();
    if (!waiting_.empty() || over_)
        return;
    handlers_.drained();
    if (reading_ == Reading::whileNothingWaits)
        takeFrames(); // those that came before
}

// What the socket does not take stays. When it fails (also because too many descriptors are under
// way) it ends for both sides, which find that by reading: a mute channel would help nobody.
void LauncherChannel::writeWaiting() {
    while (!waiting_.empty()) {
        Outgoing& frame = waiting_.front();
        const ssize_t count =
            writeOnce(socket_.descriptor(), std::string_view(frame.bytes).substr(frame.written),
                      frame.descriptors);
        if (count < 0 && !isForLater(errno)) {
            broken_ = true;
            ::shutdown(socket_.descriptor(), SHUT_RDWR);
            waiting_.clear();
            return waitForMore();
        }
        if (count < 0)
            return socket_.waitWritable(shared_from_this());
        frame.descriptors.clear();
        frame.written += static_cast<std::size_t>(count);
        if (frame.written == frame.bytes.size())
            waiting_.pop_front();
    }
}

void LauncherChannel::lose(const char* fault) {
    const auto lost = std::move(handlers_.lost);
    close();
    lost(fault);
}

} // namespace platform::launcher
