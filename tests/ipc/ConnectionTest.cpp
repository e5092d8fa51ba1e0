#include "platform/ipc/Connection.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "platform/ipc/Cbor.h"
#include "tests/ipc/Harness.h"

namespace {

using namespace platform;
using namespace platform::ipc;
using namespace tests;

class ConnectionTest : public testing::Test {
protected:
    // Whether a client that comes now is served.
    void expectServed() {
        RawClient client(path_);
        ASSERT_TRUE(client.write(request(99, Dictionary{{"a", 1}})));
        const auto reply = client.read();
        ASSERT_TRUE(reply);
        EXPECT_EQ(reply->kind, 3);
        EXPECT_EQ(reply->id, 99U);
        EXPECT_EQ(reply->body, (Dictionary{{"a", 1}}));
    }

    TestFolder folder_;
    const std::string path_ = folder_ / "service";
};

// Keeps the service queue busy until it is let go.
class Block {
public:
    explicit Block(SerialQueue& queue) {
        std::promise<void> begun;
        queue.async([&begun, end = end_.get_future().share()] {
            begun.set_value();
            end.wait();
        });
        begun.get_future().wait();
    }

    void release() { end_.set_value(); }

private:
    std::promise<void> end_;
};

TEST_F(ConnectionTest, GreetsFirstAndTakesOneRightAnswer) {
    EchoServer server(path_, {}, [](Connection& connection, const Message& message) {
        Reply reply = createReply(message);
        reply.body.set("greeted", message.greeted);
        connection.send(reply);
    });
    RawClient client(path_);
    const Value* challenge = client.greeting.find("challenge");
    ASSERT_TRUE(challenge && challenge->data());
    EXPECT_EQ(challenge->data()->bytes.size(), challengeSize);
    client.write(request(1, Dictionary{}));
    EXPECT_EQ(client.read()->body, (Dictionary{{"greeted", false}}));
    client.answerGreeting();
    client.write(request(2, Dictionary{}));
    EXPECT_EQ(client.read()->body, (Dictionary{{"greeted", true}}));
    client.answerGreeting();
    EXPECT_TRUE(client.atEnd());

    RawClient wrong(path_);
    wrong.write(
        frame(5, 0, encode(Dictionary{{"challenge", Data{SharedBytes("0123456789abcdef")}}})));
    EXPECT_TRUE(wrong.atEnd());
    EXPECT_NE(RawClient(path_).greeting, client.greeting);
}

TEST_F(ConnectionTest, TruncatedRequestsAreNeverCarriedOut) {
    EchoServer server(path_);
    const std::string whole = request(1, Dictionary{{"request", "find"}, {"list", Array{1, "b"}}});
    for (std::size_t length = 0; length < whole.size(); ++length) {
        RawClient client(path_);
        client.write(whole.substr(0, length));
        client.endWriting();
        EXPECT_TRUE(client.atEnd()) << length;
    }
    EXPECT_TRUE(server.gone.reaches(static_cast<int>(whole.size())));
    EXPECT_EQ(server.requests.value(), 0);
    expectServed();
}

TEST_F(ConnectionTest, LargeRequestsAndRepliesComeThrough) {
    EchoServer server(path_);
    RawClient client(path_);
    for (const std::size_t size : {100'000U, 1'000'000U, 15'000'000U}) {
        const Dictionary body{{"data", Data{SharedBytes(std::string(size, 'x'))}}};
        std::jthread writer([&] { client.write(request(1, body)); });
        const auto reply = client.read();
        ASSERT_TRUE(reply) << size;
        EXPECT_TRUE(reply->body == body) << size;
    }
}

TEST_F(ConnectionTest, AfterAHalfCloseQueuedRepliesAreFlushedAndNothingElseIsDone) {
    EchoServer server(path_, {}, [](Connection& connection, const Message& message) {
        Reply reply = createReply(message);
        reply.body.set("data", Data{SharedBytes(std::string(4'000'000, 'x'))});
        connection.send(reply);
    });
    RawClient client(path_);
    client.write(request(1, Dictionary{}) + request(2, Dictionary{}));
    ASSERT_TRUE(server.requests.reaches(1));
    client.endWriting();
    ASSERT_TRUE(server.gone.reaches(1));
    const auto reply = client.read();
    ASSERT_TRUE(reply);
    EXPECT_EQ(reply->body.find("data")->data()->bytes.size(), 4'000'000U);
    EXPECT_TRUE(client.atEnd());
    EXPECT_EQ(server.requests.value(), 1);
}

TEST_F(ConnectionTest, AReplyPastTheLimitsBecomesAShortError) {
    EchoServer server(path_, {}, [](Connection& connection, const Message& message) {
        const SharedBytes large(std::string(70U << 20U, 'x'));
        Reply reply = createReply(message);
        reply.body.set("a", Array{Data{large}, Data{large}, Data{large}, Data{large}});
        connection.send(reply);
    });
    RawClient client(path_);
    client.write(request(7, Dictionary{}));
    const auto reply = client.read();
    ASSERT_TRUE(reply);
    EXPECT_EQ(reply->id, 7U);
    EXPECT_EQ(reply->body, (Dictionary{{"errorcode", 4}, {"error", "invalid request format"}}));
}

TEST_F(ConnectionTest, AFloodDoesNotDelayOthersByMoreThanItsTurn) {
    std::mutex mutex;
    std::vector<std::uint64_t> order;
    EchoServer server(path_, {}, [&](Connection& connection, const Message& message) {
        const std::lock_guard lock(mutex);
        order.push_back(message.id);
        connection.send(createReply(message));
    });
    Block block(server.queue());
    RawClient flooder(path_);
    RawClient polite(path_);
    std::string flood;
    for (std::uint64_t i = 0; i < 200; ++i)
        flood += request(1000 + i, Dictionary{});
    flooder.write(flood);
    flooder.write(request(1, Dictionary{})); // the loop has read what came before this
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    for (std::uint64_t i = 0; i < 5; ++i)
        polite.write(request(i, Dictionary{}));
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    block.release();
    for (int i = 0; i < 5; ++i)
        ASSERT_TRUE(polite.read());
    const std::lock_guard lock(mutex);
    // Their turns alternate, so the last of the five has about as many of the flood before it.
    const auto last = std::ranges::find(order, 4U);
    EXPECT_LE(last - order.begin(), 5 + 7);
}

// They come in one read, and no byte after them wakes the daemon.
TEST_F(ConnectionTest, MoreRequestsThanMayWaitAreAllCarriedOut) {
    Limits limits;
    limits.waitingRequests = 8;
    EchoServer server(path_, limits);
    RawClient client(path_);
    std::string all;
    for (std::uint64_t i = 0; i < 60; ++i)
        all += request(i, Dictionary{{"number", i}});
    client.write(all);
    for (std::uint64_t i = 0; i < 60; ++i)
        ASSERT_EQ(client.read()->id, i);
}

TEST_F(ConnectionTest, ReadingPausesAtTheLimitAndGoesOn) {
    Limits limits;
    limits.waitingRequests = 8;
    EchoServer server(path_, limits);
    Block block(server.queue());
    RawClient client(path_);
    // More than the sockets hold, so that writing stops when reading does.
    const Dictionary body{{"data", Data{SharedBytes(std::string(100'000, 'x'))}}};
    std::atomic<int> written = 0;
    std::jthread writer([&] {
        for (std::uint64_t i = 0; i < 60; ++i) {
            client.write(request(i, body));
            ++written;
        }
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    EXPECT_LT(written, 20);
    block.release();
    for (std::uint64_t i = 0; i < 60; ++i)
        ASSERT_EQ(client.read()->id, i);
}

TEST_F(ConnectionTest, AHangUpIsNoticedWhileReadingIsPaused) {
    Limits limits;
    limits.waitingRequests = 4;
    EchoServer server(path_, limits);
    Block block(server.queue());
    {
        RawClient client(path_);
        std::string flood;
        for (std::uint64_t i = 0; i < 50; ++i)
            flood += request(i, Dictionary{});
        client.write(flood);
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        EXPECT_EQ(server.gone.value(), 0);
    }
    EXPECT_TRUE(server.gone.reaches(1)); // with the service queue still busy
    block.release();
    expectServed();
    EXPECT_EQ(server.requests.value(), 2); // the one that was handed out, and this
}

TEST_F(ConnectionTest, WaitingRequestsOfAUserAreLimitedTogether) {
    Limits limits;
    limits.userWaitingBytes = 1'000'000;
    EchoServer server(path_, limits);
    Block block(server.queue());
    const Dictionary body{{"data", Data{SharedBytes(std::string(300'000, 'x'))}}};
    std::vector<std::unique_ptr<RawClient>> clients;
    std::vector<std::jthread> threads;
    std::atomic<int> written = 0;
    Counter answered;
    for (int i = 0; i < 6; ++i) {
        auto& client = *clients.emplace_back(std::make_unique<RawClient>(path_));
        threads.emplace_back([&] {
            for (std::uint64_t id = 0; id < 10 && client.write(request(id, body)); ++id)
                ++written;
        });
        threads.emplace_back([&] {
            for (std::uint64_t id = 0; id < 10 && client.read(); ++id)
                answered.add();
        });
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    EXPECT_LT(written, 20);
    // Small requests of others go through all the same, as soon as the queue does.
    RawClient small(path_);
    small.write(request(1, Dictionary{}));
    block.release();
    EXPECT_TRUE(small.read());
    EXPECT_TRUE(answered.reaches(60));
}

// Whether a child process could write with a client's socket.
bool writeFromChild(RawClient& client, std::string_view bytes) {
    const pid_t child = ::fork();
    if (child == 0)
        ::_exit(client.write(bytes) ? 0 : 1);
    int status = 1;
    ::waitpid(child, &status, 0);
    return status == 0;
}

// One read ends where another process's bytes begin, and the socket tells of none of them again.
TEST_F(ConnectionTest, FindsWhatOneReadLeftBehind) {
    EchoServer server(path_);
    RawClient client(path_);
    const std::string text = request(1, Dictionary{});
    client.write(text);
    ASSERT_TRUE(client.read());
    const auto whileTheLoopIsHeld = [&](auto&& act) {
        std::promise<void> release;
        server.loop().post([held = release.get_future()]() mutable { held.wait(); });
        act();
        release.set_value();
    };
    whileTheLoopIsHeld([&] {
        client.write(text);
        ASSERT_TRUE(writeFromChild(client, text));
        client.write(text);
    });
    for (int i = 0; i < 3; ++i)
        EXPECT_TRUE(client.read());
    RawClient leaving(path_);
    leaving.write(text);
    ASSERT_TRUE(leaving.read());
    whileTheLoopIsHeld([&] {
        leaving.write(text);
        leaving.endWriting();
    });
    EXPECT_TRUE(server.gone.reaches(1));
}

TEST_F(ConnectionTest, TellsWhoseBytesARequestIsMadeOf) {
    EchoServer server(path_, {}, [](Connection& connection, const Message& message) {
        Reply reply = createReply(message);
        reply.body.set("fromPeer", message.fromPeer);
        reply.body.set("greeted", message.greeted);
        connection.send(reply);
    });
    RawClient client(path_);
    client.answerGreeting();
    const auto expectRequest = [&](bool fromPeer, bool greeted) {
        EXPECT_EQ(client.read()->body, (Dictionary{{"fromPeer", fromPeer}, {"greeted", greeted}}));
    };
    const std::string text = request(1, Dictionary{});
    const auto fromChild = [&](std::string_view part) { return writeFromChild(client, part); };
    client.write(text);
    expectRequest(true, true);
    ASSERT_TRUE(fromChild(text));
    expectRequest(false, true);
    client.write(text);
    expectRequest(true, true);
    client.write(text.substr(0, 10));
    ASSERT_TRUE(fromChild(text.substr(10)));
    expectRequest(false, false);
    ASSERT_TRUE(fromChild(text.substr(0, 16)));
    client.write(text.substr(16) + text);
    expectRequest(false, false);
    expectRequest(true, false);
}

} // namespace
