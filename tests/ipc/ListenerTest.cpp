#include "platform/ipc/Listener.h"

#include <cerrno>
#include <string>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "tests/ipc/Harness.h"

namespace {

using namespace platform;
using namespace platform::ipc;
using namespace tests;

void ignoreEvents(const ListenerEvent&) {}

class ListenerTest : public testing::Test {
protected:
    [[nodiscard]] auto listen(const std::string& path) {
        return Listener::create(loop_, path, ignoreEvents);
    }

    [[nodiscard]] unsigned modeOf(const std::string& path) {
        struct stat status{};
        return ::stat(path.c_str(), &status) == 0 ? status.st_mode & 07777U : 0;
    }

    TemporaryFolder folder_;
    Loop loop_{"ipc"};
};

TEST_F(ListenerTest, MakesFolderAndSocketForEverybody) {
    const ::mode_t before = ::umask(077);
    const auto listener = listen(folder_.path() + "/run/service");
    ::umask(before);
    ASSERT_TRUE(listener) << describe(listener.error());
    EXPECT_EQ(modeOf(folder_.path() + "/run"), 0755U);
    EXPECT_EQ(modeOf(folder_.path() + "/run/service"), 0666U);
}

TEST_F(ListenerTest, ASecondDaemonOnALiveNameFails) {
    const std::string path = folder_.path() + "/service";
    auto first = listen(path);
    ASSERT_TRUE(first);
    const auto second = listen(path);
    ASSERT_FALSE(second);
    EXPECT_EQ(second.error().code, EADDRINUSE);
    first->reset();
    EXPECT_TRUE(listen(path));
}

TEST_F(ListenerTest, AStaleSocketIsReplaced) {
    const std::string path = folder_.path() + "/service";
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    const UniqueFd stale(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    ASSERT_EQ(::bind(stale.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    EchoServer server(path);
    EXPECT_FALSE(RawClient(path).greeting.empty());
}

TEST_F(ListenerTest, WhatIsNoSocketIsLeftAlone) {
    const std::string path = folder_.path() + "/service";
    ASSERT_FALSE(writeFileAtomically(path, "precious"));
    EXPECT_FALSE(listen(path));
    EXPECT_EQ(readRegularFile(path, 100)->bytes, "precious");
}

TEST_F(ListenerTest, APathThatDoesNotFitIsAClearError) {
    const std::size_t left = longestSocketPath - folder_.path().size() - 1;
    EXPECT_TRUE(listen(folder_.path() + "/" + std::string(left, 'x')));
    const auto tooLong = listen(folder_.path() + "/" + std::string(left + 1, 'x'));
    ASSERT_FALSE(tooLong);
    EXPECT_EQ(tooLong.error().code, ENAMETOOLONG);
}

TEST_F(ListenerTest, CancelRemovesTheSocketAndIsTheLastEvent) {
    const std::string path = folder_.path() + "/service";
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

TEST_F(ListenerTest, LeavesDescriptorsForTheDaemonsOwnWorkAndGoesOnWhenThereAreMore) {
    rlimit before{};
    ::getrlimit(RLIMIT_NOFILE, &before);
    rlimit tight = before;
    tight.rlim_cur = 200;
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &tight), 0);
    {
        EchoServer server(folder_.path() + "/service");
        std::vector<UniqueFd> hoard;
        while (hoard.empty() || hoard.back().get() < 180)
            hoard.emplace_back(::dup(0));
        EXPECT_TRUE(RawClient(folder_.path() + "/service").greeting.empty());
        EXPECT_EQ(server.connections.value(), 0);
        hoard.clear();
        EXPECT_FALSE(RawClient(folder_.path() + "/service").greeting.empty());
        EXPECT_TRUE(server.connections.reaches(1));
    }
    ::setrlimit(RLIMIT_NOFILE, &before);
}

} // namespace
