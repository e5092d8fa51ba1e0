#include "platform/ipc/Connection.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/ipc/Cbor.h"
#include "tests/ipc/Harness.h"
#include "tests/support/Gate.h"

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

// Requests with these numbers and empty bodies, as one text.
std::string requests(std::uint64_t from, std::uint64_t count) {
    std::string all;
    for (std::uint64_t id = from; id < from + count; ++id)
        all += request(id, Dictionary{});
    return all;
}

void expectRepliesInOrder(RawClient& client, std::uint64_t count) {
    for (std::uint64_t id = 0; id < count; ++id)
        ASSERT_EQ(client.read()->id, id);
}

// Answers each request with this.
EchoServer::Serve answer(std::string_view key, const Value& value) {
    return [key, value](Connection& connection, const Message& message) {
        Reply reply = createReply(message);
        reply.body.set(key, value);
        connection.send(reply);
    };
}

// Answers whose a request is.
void tellOrigin(Connection& connection, const Message& message) {
    Reply reply = createReply(message);
    reply.body = {{"fromPeer", message.fromPeer}, {"greeted", message.greeted}};
    connection.send(reply);
}

void settle(int milliseconds) {
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}

TEST_F(ConnectionTest, GreetsFirstAndTakesOneRightAnswer) {
    EchoServer server(path_, {}, tellOrigin);
    RawClient client(path_);
    const Value* challenge = client.greeting.find("challenge");
    ASSERT_TRUE(challenge && challenge->data());
    EXPECT_EQ(challenge->data()->bytes.size(), challengeSize);
    client.write(requests(1, 1));
    EXPECT_EQ(client.read()->body, (Dictionary{{"fromPeer", true}, {"greeted", false}}));
    client.answerGreeting();
    client.write(requests(2, 1));
    EXPECT_EQ(client.read()->body, (Dictionary{{"fromPeer", true}, {"greeted", true}}));
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
        EXPECT_TRUE(reply && reply->body == body) << size;
    }
}

TEST_F(ConnectionTest, AfterAHalfCloseQueuedRepliesAreFlushedAndNothingElseIsDone) {
    EchoServer server(path_, {}, answer("data", Data{SharedBytes(std::string(4'000'000, 'x'))}));
    RawClient client(path_);
    client.write(requests(1, 2));
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
    const Data large{SharedBytes(std::string(70U << 20U, 'x'))};
    EchoServer server(path_, {}, answer("a", Array{large, large, large, large}));
    RawClient client(path_);
    client.write(requests(7, 1));
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
    Gate gate(server.queue());
    RawClient flooder(path_);
    RawClient polite(path_);
    flooder.write(requests(1000, 200));
    flooder.write(requests(1, 1)); // the loop has read what came before this
    settle(50);
    polite.write(requests(0, 5));
    settle(50);
    gate.open();
    expectRepliesInOrder(polite, 5);
    const std::lock_guard lock(mutex);
    // Their turns alternate, so the last of the five has about as many of the flood before it.
    const auto last = std::ranges::find(order, 4U);
    EXPECT_LE(last - order.begin(), 5 + 7);
}

// They come in one read, and no byte after them wakes the daemon.
TEST_F(ConnectionTest, MoreRequestsThanMayWaitAreAllCarriedOut) {
    EchoServer server(path_, {.waitingRequests = 8});
    RawClient client(path_);
    client.write(requests(0, 60));
    expectRepliesInOrder(client, 60);
}

TEST_F(ConnectionTest, ReadingPausesAtTheLimitAndGoesOn) {
    EchoServer server(path_, {.waitingRequests = 8});
    Gate gate(server.queue());
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
    settle(300);
    EXPECT_LT(written, 20);
    gate.open();
    expectRepliesInOrder(client, 60);
}

TEST_F(ConnectionTest, AHangUpIsNoticedWhileReadingIsPaused) {
    EchoServer server(path_, {.waitingRequests = 4});
    Gate gate(server.queue());
    {
        RawClient client(path_);
        client.write(requests(0, 50));
        settle(50);
        EXPECT_EQ(server.gone.value(), 0);
    }
    EXPECT_TRUE(server.gone.reaches(1)); // with the service queue still busy
    gate.open();
    expectServed();
    EXPECT_EQ(server.requests.value(), 2); // the one that was handed out, and this
}

TEST_F(ConnectionTest, WaitingRequestsOfAUserAreLimitedTogether) {
    EchoServer server(path_, {.userWaitingBytes = 1'000'000});
    Gate gate(server.queue());
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
    settle(300);
    EXPECT_LT(written, 20);
    // Small requests of others go through all the same, as soon as the queue does.
    RawClient small(path_);
    small.write(requests(1, 1));
    gate.open();
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
    const std::string text = requests(1, 1);
    client.write(text);
    ASSERT_TRUE(client.read());
    const auto whileTheLoopIsHeld = [&](auto&& act) {
        const Signal release;
        server.loop().post([release] { EXPECT_TRUE(release.comes()); });
        act();
        release.give();
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
    EchoServer server(path_, {}, tellOrigin);
    RawClient client(path_);
    client.answerGreeting();
    const auto expectRequest = [&](bool fromPeer, bool greeted) {
        EXPECT_EQ(client.read()->body, (Dictionary{{"fromPeer", fromPeer}, {"greeted", greeted}}));
    };
    const std::string text = requests(1, 1);
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
