// Holds, and the ends of plug-ins that they wait for, with a job manager as a test wants it.

#include <chrono>
#include <filesystem>
#include <string>
#include <thread>

#include <gmock/gmock.h>

#include "tests/server/ClientFixture.h"
#include "tests/support/LogOf.h"
#include "zpd/ZPDPlugInHold.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::ProcessActivity;
using testing::HasSubstr;

constexpr unsigned ofPlugIns = 1;
constexpr unsigned refuseBusy = 2;
constexpr unsigned terminate = 4;

class LockTest : public ClientFixture {
protected:
    // A plug-in whose path exists.
    std::shared_ptr<FakePlugIn> addHeld(const std::string& identifier) {
        auto plugIn = addPlugIn(identifier);
        plugIn->path = folder_ / identifier + ".appex";
        std::filesystem::create_directories(*plugIn->path);
        return plugIn;
    }

    static Dictionary lock(const std::vector<std::shared_ptr<FakePlugIn>>& plugIns,
                           unsigned flags = 0) {
        Array paths;
        for (const auto& plugIn : plugIns)
            paths.append(*plugIn->path);
        return {
            {"request", "lock"}, {"version", 3}, {"paths", paths}, {"flags", ofPlugIns | flags}};
    }

    bool isHeld(const FakePlugIn& plugIn) {
        return server().holdOnPlugIn(*server().findPlugIn(plugIn.uuid));
    }

    // Asked on a connection of the test's, so that the client is there.
    Awaited<Reply> begin(const Dictionary& request) {
        (void)client();
        return beginToAskThroughClient(request);
    }

    void awaitRemovals(std::size_t count) {
        while (platform_.jobs.waiting() < count)
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
};

TEST_F(LockTest, WaitsForEveryTerminationButNobodyWaitsForIt) {
    const auto a = addHeld("a");
    const auto b = addHeld("b");
    a->info->set("BQBundleVersion", "2");
    platform_.jobs.answers = false;
    platform_.jobs.codes = {{"a", 0}, {"b", 5}};
    const std::string log = logOf([&] {
        const auto reply = begin(lock({a, b, a}, terminate));
        awaitRemovals(2);
        EXPECT_TRUE(isHeld(*a)) << "before the reply";
        EXPECT_TRUE(askThroughClient({{"request", "find"}, {"version", 3}})) << "is served";
        platform_.jobs.answer("b");
        platform_.jobs.answer("a");
        EXPECT_TRUE(reply.get()->contains("uuids"));
    });
    EXPECT_EQ(platform_.jobs.removed, (std::vector<std::string>{"a 2", "b 1"}));
    EXPECT_THAT(log, HasSubstr("jobd error attempting to terminate plug-ins: error="));
    EXPECT_TRUE(begin(lock({}, terminate)).get()->contains("uuids")) << "with nothing to end";
}

TEST_F(LockTest, OutlivesItsClientAndGoesWithTheServer) {
    const auto a = addHeld("a");
    platform_.jobs.answers = false;
    const auto reply = begin(lock({a}, terminate));
    awaitRemovals(1);
    disconnect();
    EXPECT_FALSE(isHeld(*a)) << "the client took its hold along";
    platform_.jobs.answer("a");
    server().terminatePlugIns({a}, [] { ADD_FAILURE() << "the server has gone"; });
    awaitRemovals(1);
    endClient();
    stopServer();
    platform_.jobs.answer("a");
}

TEST_F(LockTest, IsRefusedForWhoIsBusy) {
    const auto a = addHeld("a");
    platform_.assertions.busy = {Dictionary{{"incomplete", 1}},
                                 Dictionary{{"BQBundleIdentifier", "a"}, {"more", 1}},
                                 Dictionary{{"BQBundleIdentifier", "x"}}};
    const auto reply = begin(lock({a}, refuseBusy | terminate)).get();
    EXPECT_EQ(*reply, (Dictionary{{"conflicts", Array{Dictionary{{"BQBundleIdentifier", "a"}}}},
                                  {"errorcode", 14},
                                  {"error", "plug-ins are busy"}}));
    EXPECT_EQ(platform_.assertions.asked, std::vector{std::set<std::string>{"a"}});
    EXPECT_FALSE(isHeld(*a));
    EXPECT_TRUE(platform_.jobs.removed.empty());
    platform_.assertions.busy.resize(1);
    EXPECT_TRUE(begin(lock({a}, refuseBusy)).get()->contains("uuids")) << "nobody that is known";
}

TEST_F(LockTest, KeepsTheProcessBusyAndIsBoundedForEachClient) {
    const auto a = addHeld("a");
    const std::size_t before = ProcessActivity::openCount();
    for (std::size_t i = 0; i < ZPDServer::mostHolds; ++i)
        ASSERT_TRUE(begin(lock({a})).get()->contains("uuids"));
    EXPECT_EQ(ProcessActivity::openCount() - before, ZPDServer::mostHolds);
    EXPECT_EQ(textIn(*begin(lock({a})).get(), "error"),
              "a client may have at most 1024 holds at a time");
    EXPECT_EQ(failureOf(lock({a})), "") << "another client";
    endClient();
    stopServer();
    EXPECT_EQ(ProcessActivity::openCount(), before);
}

} // namespace
