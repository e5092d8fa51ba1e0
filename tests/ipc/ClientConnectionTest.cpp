#include "platform/ipc/ClientConnection.h"

#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <iterator>
#include <sys/mman.h>
#include <thread>
#include <unistd.h>

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

// A file that holds a number.
std::shared_ptr<const UniqueFd> numbered(std::uint64_t number) {
    UniqueFd file(::memfd_create("numbered", MFD_CLOEXEC));
    EXPECT_EQ(::pwrite(file.get(), &number, sizeof number, 0), ssize_t{sizeof number});
    return std::make_shared<const UniqueFd>(std::move(file));
}

std::uint64_t numberIn(const UniqueFd& file) {
    std::uint64_t number = 0;
    return ::pread(file.get(), &number, sizeof number, 0) == sizeof number ? number : 0;
}

std::ptrdiff_t openDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

// Every second reply with a descriptor, every fifth too large for the socket: replies are glued,
// queued and cut, and each descriptor must still come with its own.
void sendNumbered(Connection& connection, const Message& message) {
    constexpr std::size_t large = 300'000;
    const std::uint64_t number = message.body.find("number")->unsignedInteger().value_or(0);
    Reply reply = createReply(message);
    reply.body = message.body;
    if (number % 5 == 0)
        reply.body.set("much", Data{SharedBytes(std::string(large, 'x'))});
    if (number % 2 == 1)
        reply.descriptor = numbered(number);
    connection.send(reply);
}

TEST_F(ClientConnectionTest, DescriptorsComeWithTheirOwnReplies) {
    constexpr unsigned count = 400;
    EchoServer server(path_, {}, sendNumbered);
    connect();
    askAndWait({{"number", 2U}});
    const auto before = openDescriptors();
    Counter replies;
    int wrong = 0;
    for (unsigned number = 0; number < count; ++number) {
        if (number % 7 == 0) { // did not ask for one
            ask({{"number", number}});
            continue;
        }
        client_->sendForDescriptor({{"number", number}}, [&, number](auto reply) {
            const bool flagged = reply && (::fcntl(reply->descriptor.get(), F_GETFD) & FD_CLOEXEC);
            const bool right = number % 2 == 0 ? reply && !reply->descriptor
                                               : flagged && numberIn(reply->descriptor) == number;
            wrong += right ? 0 : 1;
            replies.add();
        });
    }
    ASSERT_TRUE(replies.reaches(count - (count + 6) / 7));
    server.queue().sync([] {});
    queue_->sync([] {});
    EXPECT_EQ(wrong, 0);
    // The loop lets go of a descriptor a moment after the client has its copy.
    for (int tries = 0; tries < 1000 && openDescriptors() != before; ++tries)
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    EXPECT_EQ(openDescriptors(), before);
}

} // namespace
