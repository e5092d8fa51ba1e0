#include "tests/ipc/Harness.h"

#include <chrono>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include "platform/ipc/Cbor.h"

namespace tests {

using namespace platform;
using namespace platform::ipc;

namespace {

constexpr std::chrono::seconds patience{20};

} // namespace

void Counter::add(int count) {
    const std::lock_guard lock(mutex_);
    value_ += count;
    changed_.notify_all();
}

int Counter::value() const {
    const std::lock_guard lock(mutex_);
    return value_;
}

bool Counter::reaches(int count) const {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, patience, [&] { return value_ >= count; });
}

EchoServer::EchoServer(std::string path, const Limits& limits, Serve serve)
    : serve_(std::move(serve)) {
    if (!serve_) {
        serve_ = [](Connection& connection, const Message& message) {
            Reply reply = createReply(message);
            reply.body = message.body;
            connection.send(reply);
        };
    }
    auto listener = Listener::create(
        loop_, path,
        [this](const ListenerEvent& event) {
            if (const auto* connection = std::get_if<std::shared_ptr<Connection>>(&event))
                adopt(*connection);
        },
        limits);
    if (!listener)
        throw std::runtime_error(describe(listener.error()));
    listener_ = std::move(*listener);
    listener_->resume();
    loop_.start();
}

EchoServer::~EchoServer() {
    listener_->cancel();
    stopping_ = true;
    loop_.stop();
    queue_.sync([] {}); // after this no handler uses the queue
}

void EchoServer::adopt(const std::shared_ptr<Connection>& connection) {
    connections.add();
    connection->setEventHandler([this, weak = std::weak_ptr(connection)](Event event) {
        if (std::holds_alternative<ConnectionError>(event))
            return gone.add();
        auto* message = std::get_if<Message>(&event);
        if (!message || stopping_)
            return;
        queue_.async([this, weak, request = std::move(*message)]() mutable {
            requests.add();
            if (const auto there = weak.lock())
                serve_(*there, request);
            request.ticket.taken();
        });
    });
    connection->resume();
}

RawClient::RawClient(const std::string& path)
    : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    if (::connect(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0)
        throw std::runtime_error("connect");
    const timeval timeout{.tv_sec = patience.count(), .tv_usec = 0};
    ::setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
    if (auto first = read())
        greeting = first->body;
}

bool RawClient::write(std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (count <= 0)
            return false;
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

bool RawClient::readExactly(char* to, std::size_t count) {
    while (count > 0) {
        const ssize_t got = ::recv(socket_.get(), to, count, 0);
        if (got <= 0)
            return false;
        to += got;
        count -= static_cast<std::size_t>(got);
    }
    return true;
}

std::optional<RawClient::Received> RawClient::read() {
    std::string head(frameHeaderSize, '\0');
    if (!readExactly(head.data(), head.size()))
        return std::nullopt;
    const auto number = [&](std::size_t from, std::size_t count) {
        std::uint64_t n = 0;
        for (std::size_t i = count; i-- > 0;)
            n = n << 8U | static_cast<std::uint8_t>(head[from + i]);
        return n;
    };
    std::string body(number(0, 4), '\0');
    if (!readExactly(body.data(), body.size()))
        return std::nullopt;
    const auto value = decode(body, {.allowEncoded = true});
    if (!value || !value->dictionary())
        throw std::runtime_error("the server sent a malformed frame");
    return Received{static_cast<std::uint8_t>(head[4]), number(8, 8), *value->dictionary()};
}

void RawClient::answerGreeting() {
    write(frame(5, 0, encode(greeting)));
}

void RawClient::endWriting() {
    ::shutdown(socket_.get(), SHUT_WR);
}

std::string frame(std::uint8_t kind, std::uint64_t id, std::string_view body) {
    FrameHeader header;
    header.bodySize = static_cast<std::uint32_t>(body.size());
    header.kind = static_cast<FrameKind>(kind);
    header.messageId = id;
    const auto bytes = header.bytes();
    return std::string(bytes.data(), bytes.size()).append(body);
}

std::string request(std::uint64_t id, const Value& body) {
    return frame(1, id, encode(body));
}

} // namespace tests
