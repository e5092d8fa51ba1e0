#include "platform/ipc/Listener.h"

#include <array>
#include <chrono>
#include <cstring>
#include <netinet/in.h>
#include <string>
#include <sys/resource.h>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "platform/ipc/ServiceSocket.h"
#include "platform/ipc/WaitBreaker.h"
#include "tests/ipc/Harness.h"
#include "tests/support/Files.h"

namespace {

using namespace platform;
using namespace platform::ipc;
using namespace tests;

// A TCP socket that makes whoever drops it last wait for a minute: its peer reads nothing.
struct LingeringSocket {
    LingeringSocket() {
        const UniqueFd listening(::socket(AF_INET, SOCK_STREAM, 0));
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address;
        auto* const at = reinterpret_cast<sockaddr*>(&address);
        EXPECT_EQ(::bind(listening.get(), at, size), 0);
        EXPECT_EQ(::listen(listening.get(), 1), 0);
        EXPECT_EQ(::getsockname(listening.get(), at, &size), 0);
        mine.reset(::socket(AF_INET, SOCK_STREAM, 0));
        EXPECT_EQ(::connect(mine.get(), at, size), 0);
        peer.reset(::accept(listening.get(), nullptr, nullptr));
        const std::string much(1UL << 16, 'x');
        while (::send(mine.get(), much.data(), much.size(), MSG_DONTWAIT) > 0) {}
        const linger minute{1, 60};
        EXPECT_EQ(::setsockopt(mine.get(), SOL_SOCKET, SO_LINGER, &minute, sizeof minute), 0);
    }

    // Leaves the only reference on the way to whoever reads from the other end.
    void sendThrough(int socket) {
        iovec part{const_cast<char*>("x"), 1};
        alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
        msghdr message{nullptr, 0, &part, 1, control.data(), control.size(), 0};
        cmsghdr* const head = CMSG_FIRSTHDR(&message);
        *head = {CMSG_LEN(sizeof(int)), SOL_SOCKET, SCM_RIGHTS};
        const int number = mine.get();
        std::memcpy(CMSG_DATA(head), &number, sizeof number);
        sent = ::sendmsg(socket, &message, MSG_NOSIGNAL) == 1;
        if (sent)
            mine.reset();
        else
            (void)::setsockopt(number, SOL_SOCKET, SO_LINGER, &off, sizeof off);
    }

    static constexpr linger off{0, 0};
    UniqueFd mine;
    UniqueFd peer;
    bool sent = false;
};

class ListenerTest : public testing::Test {
protected:
    [[nodiscard]] auto listen(const std::string& path) {
        return Listener::create(loop_, path, [](const ListenerEvent&) {});
    }

    TestFolder folder_;
    Loop loop_{"ipc"};
};

TEST_F(ListenerTest, MakesFolderAndSocketForEverybody) {
    const Umask umask(077);
    const auto listener = listen(folder_ / "run/service");
    ASSERT_TRUE(listener) << describe(listener.error());
    EXPECT_EQ(modeOf(folder_ / "run"), 0755U);
    EXPECT_EQ(modeOf(folder_ / "run/service"), 0666U);
}

TEST_F(ListenerTest, WhatIsNoSocketIsLeftAlone) {
    const std::string path = folder_ / "service";
    folder_.write("service", "precious");
    EXPECT_FALSE(listen(path));
    EXPECT_EQ(contentOf(path), "precious");
}

TEST_F(ListenerTest, CancelRemovesTheSocketAndIsTheLastEvent) {
    const std::string path = folder_ / "service";
    Counter invalid;
    auto listener = Listener::create(loop_, path, [&](const ListenerEvent& event) {
        if (std::get_if<ConnectionError>(&event))
            invalid.add();
    });
    ASSERT_TRUE(listener);
    (*listener)->resume();
    loop_.start();
    (*listener)->cancel();
    EXPECT_NE(::access(path.c_str(), F_OK), 0);
    EXPECT_TRUE(invalid.reaches(1));
}

// Either the kernel refuses the descriptor, or the wait is broken.
TEST_F(ListenerTest, WhatAClientSendsAlongHoldsNobodyUp) {
    EchoServer server(folder_ / "service");
    const auto stranger = connectToService(folder_ / "service");
    ASSERT_TRUE(stranger);
    ASSERT_TRUE(server.connections.reaches(1));
    LingeringSocket socket;
    socket.sendThrough(stranger->get());
    EXPECT_EQ(socket.sent, isWaitBreakerNeeded());
    RawClient client(folder_ / "service");
    EXPECT_FALSE(client.greeting.empty());
}

TEST_F(ListenerTest, WhatIsOnItsWayToAClientThatGoesHoldsNobodyUp) {
    LingeringSocket socket;
    std::array<int, 2> ends{};
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, ends.data()), 0);
    socket.sendThrough(UniqueFd(ends[0]).get());
    ASSERT_TRUE(socket.sent);
    auto passed = std::make_shared<const UniqueFd>(ends[1]);
    EchoServer server(folder_ / "service", {}, [&](Connection& connection, const Message& message) {
        Reply first = createReply(message);
        first.body.set("data", Data{SharedBytes(std::string(4'000'000, 'x'))}); // which has to wait
        connection.send(first);
        Reply second = createReply(message);
        second.descriptor = std::move(passed);
        connection.send(second);
    });
    {
        RawClient client(folder_ / "service");
        ASSERT_TRUE(client.write(request(1, Dictionary{})));
        ASSERT_TRUE(server.requests.reaches(1));
        server.queue().sync([] {}); // both wait in the connection now
    }
    ASSERT_TRUE(server.gone.reaches(1));
    EXPECT_FALSE(RawClient(folder_ / "service").greeting.empty());
}

TEST_F(ListenerTest, AWaitForADroppedSocketIsBroken) {
    using namespace std::chrono;
    std::array<int, 2> ends{};
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, ends.data()), 0);
    const UniqueFd reader(ends[0]);
    const UniqueFd writer(ends[1]);
    std::thread([&] { // which is sent the signals
        for (int round = 0; round < 2; ++round) {
            LingeringSocket socket;
            socket.sendThrough(writer.get());
            ASSERT_TRUE(socket.sent);
            const auto before = steady_clock::now();
            breakWaits();
            char byte = 0;
            EXPECT_EQ(::recv(reader.get(), &byte, 1, 0), 1); // which drops it
            EXPECT_LT(steady_clock::now() - before, 30s);
        }
    })
        .join();
}

TEST_F(ListenerTest, LeavesDescriptorsForTheDaemonsOwnWorkAndGoesOnWhenThereAreMore) {
    rlimit before{};
    ::getrlimit(RLIMIT_NOFILE, &before);
    rlimit tight = before;
    tight.rlim_cur = 200;
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &tight), 0);
    {
        EchoServer server(folder_ / "service");
        std::vector<UniqueFd> hoard;
        while (hoard.empty() || hoard.back().get() < 180)
            hoard.emplace_back(::dup(0));
        EXPECT_TRUE(RawClient(folder_ / "service").greeting.empty());
        EXPECT_EQ(server.connections.value(), 0);
        hoard.clear();
        EXPECT_FALSE(RawClient(folder_ / "service").greeting.empty());
        EXPECT_TRUE(server.connections.reaches(1));
    }
    ::setrlimit(RLIMIT_NOFILE, &before);
}

} // namespace
