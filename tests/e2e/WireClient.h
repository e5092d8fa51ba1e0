#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "tests/e2e/Item.h"

namespace e2e {

using namespace std::chrono_literals;

enum FrameKind : unsigned {
    requestFrame = 1,
    oneWayFrame = 2,
    replyFrame = 3,
    greetingFrame = 4,
    greetingAnswerFrame = 5
};

struct Frame {
    unsigned kind = requestFrame;
    std::uint64_t id = 0;
    std::string body; // encoded
    // Only frames that shall be refused have others.
    unsigned version = 1;
    unsigned reserved = 0;
    std::optional<std::uint32_t> length; // when it is not that of the body

    [[nodiscard]] std::string bytes() const;
};

constexpr std::size_t frameHeaderSize = 16;

// A client of the daemon that speaks the wire by itself, well or badly as the test wants. One
// thread. A wait that takes too long throws, so that a test fails instead of hanging.
class WireClient {
public:
    enum class Greeting { read, leave };

    explicit WireClient(const std::string& socketPath, Greeting greeting = Greeting::read);

    // Takes over a connected socket.
    explicit WireClient(int fd) : fd_(fd) {}

    WireClient(WireClient&& other) noexcept;
    WireClient& operator=(WireClient&&) = delete;
    ~WireClient();

    [[nodiscard]] int fd() const { return fd_; }

    // Of the greeting that was read.
    [[nodiscard]] const Item& greeting() const { return greeting_; }

    // The first frame. Done by the constructor unless it was told to leave it.
    void readGreeting();
    void answerGreeting();

    // False when the daemon has ended the connection.
    bool send(std::string_view bytes);
    // As much as goes without waiting.
    std::size_t sendSome(std::string_view bytes);
    // Sends a request and gives its id; does not wait.
    std::uint64_t post(const Item& body, unsigned kind = requestFrame);

    // The next frame; nothing when the daemon has ended the connection.
    std::optional<Frame> receive(std::chrono::milliseconds patience = 20s);
    // One request and its reply's body.
    Item request(const Item& body);

    // Reads and drops frames until the daemon ends the connection; false when it does not.
    bool ended(std::chrono::milliseconds patience = 10s);

private:
    bool readable(std::chrono::steady_clock::time_point until) const;
    bool fill(std::size_t size, std::chrono::steady_clock::time_point until);

    int fd_ = -1;
    std::uint64_t nextId_ = 1;
    std::string buffer_; // read and not yet handed out
    Item greeting_;
};

// The envelope of a request of protocol version 3.
[[nodiscard]] Item envelope(const char* type, const Item& more = Item::map({}));

// Asks `condition` again and again until it holds or the time is over.
[[nodiscard]] bool eventually(const std::function<bool()>& condition,
                              std::chrono::milliseconds patience = 10s);

} // namespace e2e
