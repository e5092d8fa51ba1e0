#include "platform/ipc/ClientConnection.h"

#include <gtest/gtest.h>

#include "tests/ipc/Harness.h"

namespace {

using namespace platform;
using namespace platform::ipc;
using namespace tests;

using Result = std::expected<Dictionary, ConnectionError>;

// What a client's handlers saw. They share it, since they may be called when the test is over.
struct Seen {
    Counter replies;
    Counter events;
    std::vector<Result> results; // read after `replies` counted them
    std::vector<ConnectionError> errors;
};

class ClientConnectionTest : public testing::Test {
protected:
    void connect() {
        client_ = std::make_unique<ClientConnection>(path_, queue_);
        client_->setEventHandler([seen = seen_](ClientConnection::Event event) {
            if (const auto* error = std::get_if<ConnectionError>(&event))
                seen->errors.push_back(*error);
            seen->events.add();
        });
        client_->resume();
    }

    void ask(const Dictionary& body) {
        client_->sendWithReply(body, [seen = seen_](Result result) {
            seen->results.push_back(std::move(result));
            seen->replies.add();
        });
    }

    Result askAndWait(const Dictionary& body) {
        const int before = seen_->replies.value();
        ask(body);
        EXPECT_TRUE(seen_->replies.reaches(before + 1));
        return seen_->results.back();
    }

    TestFolder folder_;
    const std::string path_ = folder_ / "run/service";
    std::shared_ptr<SerialQueue> queue_ = std::make_shared<SerialQueue>("client");
    std::shared_ptr<Seen> seen_ = std::make_shared<Seen>();
    std::unique_ptr<ClientConnection> client_;
};

TEST_F(ClientConnectionTest, RepliesComeInOrderOnTheTargetQueue) {
    EchoServer server(path_);
    connect();
    for (int i = 0; i < 1000; ++i)
        ask({{"number", i}});
    ASSERT_TRUE(seen_->replies.reaches(1000));
    for (int i = 0; i < 1000; ++i) {
        const auto& result = seen_->results[static_cast<std::size_t>(i)];
        ASSERT_TRUE(result);
        EXPECT_EQ(*result->find("number"), Value(i));
    }
}

TEST_F(ClientConnectionTest, PendingRequestsOfALostDaemonAreInterruptedOnce) {
    auto server = std::make_unique<EchoServer>(path_, Limits{}, [](Connection&, const Message&) {});
    connect();
    for (int i = 0; i < 10; ++i)
        ask({{"a", i}});
    ASSERT_TRUE(server->requests.reaches(10));
    server.reset();
    ASSERT_TRUE(seen_->replies.reaches(10));
    ASSERT_TRUE(seen_->events.reaches(1));
    EXPECT_EQ(seen_->replies.value(), 10);
    for (const auto& result : seen_->results)
        EXPECT_EQ(result, Result(std::unexpected(ConnectionError::interrupted)));
    EXPECT_EQ(askAndWait({{"a", 1}}), Result(std::unexpected(ConnectionError::invalid)));
}

TEST_F(ClientConnectionTest, CancelAnswersPendingWithInvalid) {
    EchoServer server(path_, {}, [](Connection&, const Message&) {});
    connect();
    ask({{"a", 1}});
    ASSERT_TRUE(server.requests.reaches(1));
    client_->cancel();
    ASSERT_TRUE(seen_->replies.reaches(1));
    EXPECT_EQ(seen_->results[0], Result(std::unexpected(ConnectionError::invalid)));
    EXPECT_EQ(askAndWait({}), Result(std::unexpected(ConnectionError::invalid)));
    EXPECT_TRUE(server.gone.reaches(1));
}

} // namespace
