#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/ipc/ClientConnection.h"
#include "platform/queue/SerialQueue.h"
#include "tests/server/ClientFixture.h"

namespace {

using platform::Dictionary;
using Client = ClientFixture;

TEST_F(Client, IsServedWithoutPathAndBundle) {
    platform_.processes.paths.clear();
    EXPECT_EQ(client()->path(), "");
    EXPECT_FALSE(client()->bundle());
    EXPECT_TRUE(askThroughClient({{"version", 3}, {"request", "match"}})->contains("matches"));
}

TEST_F(Client, IsNoPlugInThatIsKeptAway) {
    platform_.jobs.shutOut = true;
    EXPECT_EQ(failureOf({{"version", 3U}, {"request", "match"}}),
              "no reply: Connection interrupted");
}

TEST_F(Client, IsGoneWithItsConnection) {
    const std::string there = client()->description();
    EXPECT_TRUE(there.starts_with("<ZPDIpcClient 0x")) << there;
    EXPECT_TRUE(there.ends_with(" pid=" + std::to_string(::getpid()) + " path=" + clientPath + ">"))
        << there;
    disconnect();
    EXPECT_EQ(client()->pid(), 0);
    EXPECT_FALSE(client()->acceptWork());
    EXPECT_FALSE(client()->connection());
    EXPECT_TRUE(client()->description().ends_with(" NO CONNECTION>")) << client()->description();
}

ZPDPlugInHold::Ptr holdOf(const ZPDPlugIn::Ptr& plugIn,
                          const std::shared_ptr<ZPDIpcClient>& client = nullptr) {
    return std::make_shared<const ZPDPlugInHold>(std::vector{plugIn}, client);
}

TEST_F(Client, TakesItsHoldsAlong) {
    const auto plugIn = server().findPlugIn(addPlugIn("a")->uuid);
    const auto other = server().findPlugIn(addPlugIn("b")->uuid);
    for (int i = 0; i < 2; ++i)
        EXPECT_FALSE(server().addHold(holdOf(plugIn, client())));
    EXPECT_FALSE(server().addHold(holdOf(other)));
    disconnect();
    EXPECT_TRUE(server().addHold(holdOf(plugIn, client()))) << "a dead client would leave it";
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_TRUE(server().holdOnPlugIn(*other)) << "nobody's hold stays";
    EXPECT_EQ(platform_.notifications.posted.size(), 5U) << "one for each made and each released";
}

TEST_F(Client, HasEntitlementsOnlyWithinARequestThatIsItsOwn) {
    platform_.signing.clientEntitlements = Dictionary{{"a", true}};
    const auto there = client();
    onServiceQueue([&] { EXPECT_FALSE(there->hasEntitlement("a")); });
}

TEST_F(Client, IsLookedAtOnceForEachRequestThatAsksWhatItMayDo) {
    for (const char* const identifier : {"a", "b", "c"})
        addPlugIn(identifier);
    EXPECT_EQ(match().size(), 3U);
    EXPECT_EQ(platform_.signing.rechecked, 1U) << "although each plug-in asked";
    (void)ask("find", {});
    EXPECT_EQ(platform_.signing.rechecked, 1U);
}

using Hold = ServerFixture;
using Posts = std::vector<std::string>;

const std::string change = "com.tovana.zephrin.annotation-change";

TEST_F(Hold, BlocksUntilItIsReleasedByToken) {
    const auto a = addPlugIn("a");
    const auto plugIn = server().findPlugIn(a->uuid);
    const auto other = server().findPlugIn(addPlugIn("b")->uuid);
    const auto hold =
        std::make_shared<ZPDPlugInHold>(std::vector{plugIn, plugIn}, std::weak_ptr<ZPDIpcClient>());
    EXPECT_EQ(hold->blocked().size(), 1U);
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_FALSE(server().addHold(hold));
    EXPECT_TRUE(server().holdOnPlugIn(*plugIn));
    EXPECT_FALSE(server().holdOnPlugIn(*other));
    server().unholdToken(platform::Uuid::random());
    EXPECT_EQ(platform_.notifications.posted, Posts(1, change)) << "an unknown token posts nothing";
    server().unholdToken(hold->uuid());
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_EQ(platform_.notifications.posted, Posts(2, change));
}

TEST_F(Hold, AllGoWithOnePostWhenTheServerStops) {
    const auto plugIn = server().findPlugIn(addPlugIn("a")->uuid);
    for (int i = 0; i < 3; ++i)
        EXPECT_FALSE(server().addHold(holdOf(plugIn)));
    server().stop();
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_EQ(platform_.notifications.posted, Posts(4, change));
}

class SlowlyKnownClient : public ClientFixture {
protected:
    SlowlyKnownClient() {
        addPlugIn("a");
        platform_.signing.clientEntitlements =
            Dictionary{{"com.tovana.private.zephrin.manager", true}};
    }

    void awaitWaiting() {
        while (platform_.signing.waiting() == 0)
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }

    // A request of the client that waits.
    [[nodiscard]] Awaited<Reply> begin() {
        (void)client();
        platform_.signing.later = true;
        auto reply = beginToAskThroughClient(discoverAll);
        awaitWaiting();
        platform_.signing.later = false;
        return reply;
    }

    const Dictionary discoverAll{{"version", 3U}, {"request", "match"}, {"flags", 0x200U}};
};

TEST_F(SlowlyKnownClient, WaitsAloneAndIsServedThen) {
    const auto reply = begin();
    EXPECT_EQ(failureOf(discoverAll), "") << "another client";
    platform_.signing.answer();
    EXPECT_TRUE(reply.get()->contains("matches"));
}

TEST_F(SlowlyKnownClient, IsNotServedAnyMoreWhenItHasGone) {
    const auto reply = begin();
    disconnect();
    EXPECT_FALSE(reply.get());
    platform_.signing.answer();
    onServiceQueue([this] { EXPECT_EQ(client()->requestCount(), 2U) << "taken up, no more"; });
}

TEST_F(SlowlyKnownClient, IsWaitedForByAServerThatEnds) {
    server();
    platform_.signing.later = true;
    platform::ipc::ClientConnection connection(folder_ / "zpd",
                                               std::make_shared<platform::SerialQueue>("replies"));
    connection.resume();
    connection.sendWithReply(discoverAll, [](const Reply&) {});
    awaitWaiting();
    const auto later = std::async(std::launch::async, [this] {
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
        platform_.signing.answer();
    });
    stopServer();
    EXPECT_EQ(platform_.signing.waiting(), 0U);
}

} // namespace
