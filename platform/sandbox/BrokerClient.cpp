#include "platform/sandbox/BrokerClient.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <limits>
#include <memory>
#include <optional>
#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/Frame.h"
#include "platform/ipc/FrameText.h"
#include "platform/ipc/ServiceSocket.h"

namespace platform {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t largestAnswer = 4096;
constexpr std::uint64_t messageId = 1;

// One request and its reply, on a connection of its own. Lives for one call.
class Exchange {
public:
    explicit Exchange(UniqueFd socket) : socket_(std::move(socket)) {}

    // 0, or an errno value.
    [[nodiscard]] int send(const Dictionary& request);
    [[nodiscard]] std::expected<Dictionary, int> receive();

    [[nodiscard]] UniqueFd takeDescriptor() { return std::move(descriptor_); }

private:
    [[nodiscard]] int await(short what) const;
    [[nodiscard]] int readMore();
    void takeDescriptorsOf(msghdr& message);
    [[nodiscard]] std::expected<std::optional<Dictionary>, int> nextReply();

    UniqueFd socket_;
    UniqueFd descriptor_;
    ipc::FrameReader reader_{ipc::FrameReader::Side::client};
    std::array<char, largestAnswer> scratch_;
    const Clock::time_point until_ = Clock::now() + BrokerClient::patience;
};

int Exchange::await(short what) const {
    for (;;) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(until_ - Clock::now());
        if (left.count() <= 0)
            return ETIMEDOUT;
        ::pollfd watched{socket_.get(), what, 0};
        const int ready = ::poll(&watched, 1, static_cast<int>(left.count()));
        if (ready > 0)
            return 0;
        if (ready < 0 && errno != EINTR)
            return errno;
    }
}

int Exchange::send(const Dictionary& request) {
    const ipc::FrameText frame(ipc::FrameKind::request, messageId, request);
    if (!frame.fits(ipc::largestRequestBody))
        return EMSGSIZE;
    std::string_view rest = frame.text();
    while (!rest.empty()) {
        const ssize_t sent = ::send(socket_.get(), rest.data(), rest.size(), MSG_NOSIGNAL);
        if (sent >= 0)
            rest.remove_prefix(static_cast<std::size_t>(sent));
        else if (errno != EAGAIN && errno != EINTR)
            return errno == EPIPE ? ECONNRESET : errno;
        else if (const int error = await(POLLOUT))
            return error;
    }
    return 0;
}

std::expected<Dictionary, int> Exchange::receive() {
    for (;;) {
        auto reply = nextReply();
        if (!reply)
            return std::unexpected(reply.error());
        if (*reply)
            return **std::move(reply);
        if (const int error = readMore())
            return std::unexpected(error);
    }
}

// The reply, if it is there. Of other frames, like the greeting, nothing is wanted.
std::expected<std::optional<Dictionary>, int> Exchange::nextReply() {
    for (;;) {
        const auto frame = reader_.next();
        if (!frame)
            return std::unexpected(EPROTO);
        if (!*frame) {
            reader_.keep();
            return std::nullopt;
        }
        const auto& header = (*frame)->header;
        if (header.kind != ipc::FrameKind::reply || header.messageId != messageId)
            continue;
        const auto value = ipc::decode((*frame)->body);
        if (!value || !value->dictionary())
            return std::unexpected(EPROTO);
        return *value->dictionary();
    }
}

int Exchange::readMore() {
    if (const int error = await(POLLIN))
        return error;
    auto room = reader_.room(scratch_.data(), scratch_.size());
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
    msghdr message{};
    const bool held = room[0].iov_len != 0;
    message.msg_iov = room.data() + (held ? 0 : 1);
    message.msg_iovlen = held ? 2 : 1;
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    const ssize_t count = ::recvmsg(socket_.get(), &message, MSG_CMSG_CLOEXEC | MSG_DONTWAIT);
    if (count < 0)
        return errno == EAGAIN || errno == EINTR ? 0 : errno;
    takeDescriptorsOf(message);
    if (count == 0)
        return ECONNRESET;
    reader_.filled(static_cast<std::size_t>(count));
    return 0;
}

void Exchange::takeDescriptorsOf(msghdr& message) {
    for (cmsghdr* part = CMSG_FIRSTHDR(&message); part; part = CMSG_NXTHDR(&message, part)) {
        if (part->cmsg_level != SOL_SOCKET || part->cmsg_type != SCM_RIGHTS)
            continue;
        int descriptor = -1;
        std::memcpy(&descriptor, CMSG_DATA(part), sizeof descriptor);
        descriptor_.reset(descriptor);
    }
}

// 0 when the daemon did not refuse.
int refusalIn(const Dictionary& reply) {
    const Value* const code = reply.find("errorcode");
    if (!code)
        return 0;
    const auto number = code->unsignedInteger().value_or(0);
    return number > 0 && number < std::numeric_limits<int>::max() ? static_cast<int>(number)
                                                                  : EPROTO;
}

} // namespace

std::expected<UniqueFd, int> BrokerClient::ask(const Dictionary& request) const {
    auto socket = ipc::connectToService(socketPath_);
    if (!socket)
        return std::unexpected(static_cast<int>(socket.error().code));
    Exchange exchange(*std::move(socket));
    if (const int error = exchange.send(request))
        return std::unexpected(error);
    const auto reply = exchange.receive();
    if (!reply)
        return std::unexpected(reply.error());
    if (const int error = refusalIn(*reply))
        return std::unexpected(error);
    UniqueFd descriptor = exchange.takeDescriptor();
    if (!descriptor)
        return std::unexpected(EMFILE); // the kernel drops what this process has no room for
    return descriptor;
}

std::expected<std::int64_t, int> BrokerClient::consume(std::string_view token) {
    auto descriptor = ask({{"request", "consume"}, {"token", token}});
    if (!descriptor)
        return std::unexpected(descriptor.error());
    return descriptor->release();
}

int BrokerClient::release(std::int64_t handle) {
    if (handle < 0 || handle > std::numeric_limits<int>::max())
        return EBADF;
    return ::close(static_cast<int>(handle)) == 0 ? 0 : errno;
}

std::expected<UniqueFd, int> BrokerClient::open(std::string_view token, std::string_view path) {
    return ask({{"request", "open"}, {"token", token}, {"path", path}});
}

} // namespace platform
