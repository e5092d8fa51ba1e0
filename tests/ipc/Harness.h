#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/file/File.h"
#include "platform/ipc/Connection.h"
#include "platform/ipc/Frame.h"
#include "platform/ipc/Limits.h"
#include "platform/ipc/Listener.h"
#include "platform/ipc/Loop.h"
#include "platform/ipc/Message.h"
#include "platform/queue/SerialQueue.h"
#include "platform/value/Value.h"
#include "tests/platform/TestFolder.h"

namespace tests {

// A number that tests wait for.
class Counter {
public:
    void add(int count = 1);
    [[nodiscard]] int value() const;
    // False when it is not reached within some seconds.
    [[nodiscard]] bool reaches(int count) const;

private:
    mutable std::mutex mutex_;
    mutable std::condition_variable changed_;
    int value_ = 0;
};

// A daemon in small: a listener, whose requests run on a queue named "service" by `serve`.
class EchoServer {
public:
    using Serve = std::function<void(platform::ipc::Connection&, const platform::ipc::Message&)>;

    // Without `serve`, every request is answered with its own body.
    explicit EchoServer(std::string path, const platform::ipc::Limits& limits = {},
                        Serve serve = {});
    ~EchoServer();

    [[nodiscard]] platform::SerialQueue& queue() { return queue_; }

    [[nodiscard]] platform::ipc::Loop& loop() { return loop_; }

    Counter connections;
    Counter requests;
    Counter gone;

private:
    void adopt(const std::shared_ptr<platform::ipc::Connection>& connection);

    platform::ipc::Loop loop_{"ipc"};
    platform::SerialQueue queue_{"service"};
    std::atomic<bool> stopping_ = false;
    Serve serve_;
    std::unique_ptr<platform::ipc::Listener> listener_;
};

// A client that speaks the wire itself, byte by byte if need be.
class RawClient {
public:
    explicit RawClient(const std::string& path);

    struct Received {
        std::uint8_t kind = 0;
        std::uint64_t id = 0;
        platform::Dictionary body;
    };

    // False when the server does not take it any more.
    bool write(std::string_view bytes);
    // The next frame; nothing at the end of the stream.
    [[nodiscard]] std::optional<Received> read();

    // True when the stream ends without another frame.
    [[nodiscard]] bool atEnd() { return !read(); }

    void answerGreeting();
    void endWriting();

    platform::Dictionary greeting; // read when the connection was made

private:
    [[nodiscard]] bool readExactly(char* to, std::size_t count);

    platform::UniqueFd socket_;
};

// A frame of any kind; of a body that is or is not what it should be.
[[nodiscard]] std::string frame(std::uint8_t kind, std::uint64_t id, std::string_view body);
[[nodiscard]] std::string request(std::uint64_t id, const platform::Value& body);

} // namespace tests
