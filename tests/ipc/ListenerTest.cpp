#include "platform/ipc/Listener.h"

#include <string>
#include <sys/resource.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "tests/ipc/Harness.h"
#include "tests/support/Files.h"

namespace {

using namespace platform;
using namespace platform::ipc;
using namespace tests;

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
