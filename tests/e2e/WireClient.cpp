#include "tests/e2e/WireClient.h"

#include <cerrno>
#include <cstring>
#include <poll.h>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/un.h>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>

namespace e2e {

namespace {

using Clock = std::chrono::steady_clock;

void putLittle(std::string& out, std::uint64_t n, int size) {
    for (int i = 0; i < size; ++i)
        out.push_back(static_cast<char>(n >> (8 * i)));
}

std::uint64_t little(std::string_view bytes) {
    std::uint64_t n = 0;
    for (std::size_t i = bytes.size(); i-- > 0;)
        n = n << 8 | static_cast<unsigned char>(bytes[i]);
    return n;
}

[[noreturn]] void fail(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

int connectTo(const std::string& socketPath) {
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    socketPath.copy(address.sun_path, sizeof address.sun_path - 1);
    if (connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        close(fd);
        fail("connect");
    }
    return fd;
}

bool peerIsGone() {
    return errno == EPIPE || errno == ECONNRESET;
}

} // namespace

std::string Frame::bytes() const {
    std::string out;
    putLittle(out, length.value_or(static_cast<std::uint32_t>(body.size())), 4);
    putLittle(out, kind, 1);
    putLittle(out, version, 1);
    putLittle(out, reserved, 2);
    putLittle(out, id, 8);
    return out + body;
}

WireClient::WireClient(const std::string& socketPath, Greeting greeting)
    : WireClient(connectTo(socketPath)) {
    if (greeting == Greeting::read)
        readGreeting();
}

void WireClient::readGreeting() {
    const std::optional<Frame> first = receive();
    if (!first || first->kind != greetingFrame)
        throw std::runtime_error("the first frame is not the greeting");
    greeting_ = decode(first->body);
}

WireClient::WireClient(WireClient&& other) noexcept
    : fd_(std::exchange(other.fd_, -1)),
      nextId_(other.nextId_),
      buffer_(std::move(other.buffer_)),
      greeting_(std::move(other.greeting_)) {}

WireClient::~WireClient() {
    if (fd_ >= 0)
        close(fd_);
}

void WireClient::answerGreeting() {
    send(Frame{.kind = greetingAnswerFrame, .body = encode(greeting_)}.bytes());
}

bool WireClient::send(std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t sent = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (sent < 0 && errno == EINTR)
            continue;
        if (sent < 0 && peerIsGone())
            return false;
        if (sent < 0)
            fail("send");
        bytes.remove_prefix(static_cast<std::size_t>(sent));
    }
    return true;
}

std::size_t WireClient::sendSome(std::string_view bytes) {
    const ssize_t sent = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    return sent < 0 ? 0 : static_cast<std::size_t>(sent);
}

std::uint64_t WireClient::post(const Item& body, unsigned kind) {
    const std::uint64_t id = nextId_++;
    send(Frame{.kind = kind, .id = id, .body = encode(body)}.bytes());
    return id;
}

bool WireClient::readable(Clock::time_point until) const {
    pollfd wait{.fd = fd_, .events = POLLIN, .revents = 0};
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(until - Clock::now());
    return poll(&wait, 1, static_cast<int>(std::max(left, 0ms).count())) > 0;
}

// True when the buffer holds `size` bytes, false at the end of the connection.
bool WireClient::fill(std::size_t size, Clock::time_point until) {
    while (buffer_.size() < size) {
        if (!readable(until))
            throw std::runtime_error("the daemon did not answer in time");
        char chunk[65536];
        const ssize_t got = recv(fd_, chunk, sizeof chunk, 0);
        if (got == 0 || (got < 0 && peerIsGone()))
            return false;
        if (got < 0)
            fail("recv");
        buffer_.append(chunk, static_cast<std::size_t>(got));
    }
    return true;
}

std::optional<Frame> WireClient::receive(std::chrono::milliseconds patience) {
    const Clock::time_point until = Clock::now() + patience;
    if (!fill(frameHeaderSize, until))
        return std::nullopt;
    const std::string_view head(buffer_.data(), frameHeaderSize);
    Frame frame{.kind = static_cast<unsigned>(little(head.substr(4, 1))),
                .id = little(head.substr(8, 8)),
                .version = static_cast<unsigned>(little(head.substr(5, 1))),
                .reserved = static_cast<unsigned>(little(head.substr(6, 2)))};
    const std::size_t length = little(head.substr(0, 4));
    if (!fill(frameHeaderSize + length, until))
        throw std::runtime_error("the daemon ended the connection within a frame");
    frame.body = buffer_.substr(frameHeaderSize, length);
    buffer_.erase(0, frameHeaderSize + length);
    if (frame.version != 1 || frame.reserved != 0)
        throw std::runtime_error("a frame of another version");
    return frame;
}

Item WireClient::request(const Item& body) {
    const std::uint64_t id = post(body);
    const std::optional<Frame> reply = receive();
    if (!reply)
        throw std::runtime_error("the daemon ended the connection instead of a reply");
    if (reply->kind != replyFrame || reply->id != id)
        throw std::runtime_error("not the reply of this request");
    return decode(reply->body);
}

bool WireClient::ended(std::chrono::milliseconds patience) {
    const Clock::time_point until = Clock::now() + patience;
    buffer_.clear();
    while (readable(until)) {
        char chunk[65536];
        const ssize_t got = recv(fd_, chunk, sizeof chunk, 0);
        if (got == 0 || (got < 0 && peerIsGone()))
            return true;
    }
    return false;
}

Item envelope(const char* type, const Item& more) {
    return Item::map({{"request", type}, {"version", 3}}).merged(more);
}

bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds patience) {
    const Clock::time_point until = Clock::now() + patience;
    while (!condition()) {
        if (Clock::now() > until)
            return false;
        std::this_thread::sleep_for(5ms);
    }
    return true;
}

} // namespace e2e
