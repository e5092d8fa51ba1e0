#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

#include "tests/server/ClientFixture.h"

namespace {

using platform::Dictionary;
using Client = ClientFixture;

TEST_F(Client, KnowsWhoIsThere) {
    folder_.write("Client.app/Info.plist",
                  "<plist version=\"1.0\"><dict><key>BQBundleExecutable</key>"
                  "<string>run</string></dict></plist>");
    const std::string path = folder_.write("Client.app/run", "");
    platform_.processes.paths[::getpid()] = path;
    EXPECT_EQ(client()->pid(), ::getpid());
    EXPECT_EQ(client()->path(), path);
    ASSERT_TRUE(client()->bundle());
    EXPECT_EQ(client()->bundle()->path(), folder_ / "Client.app");
    EXPECT_TRUE(client()->connection());
    const std::string description = client()->description();
    EXPECT_TRUE(description.starts_with("<ZPDIpcClient 0x")) << description;
    EXPECT_TRUE(description.ends_with(" pid=" + std::to_string(::getpid()) + " path=" + path + ">"))
        << description;
}

TEST_F(Client, IsServedWithoutPathAndBundle) {
    platform_.processes.paths.clear();
    EXPECT_EQ(client()->path(), "");
    EXPECT_FALSE(client()->bundle());
    EXPECT_TRUE(askThroughClient({{"version", 3}, {"request", "match"}})->contains("matches"));
}

TEST_F(Client, IsGoneWithItsConnection) {
    (void)client();
    disconnect();
    EXPECT_EQ(client()->pid(), 0);
    EXPECT_FALSE(client()->acceptWork());
    EXPECT_FALSE(client()->connection());
    EXPECT_TRUE(client()->description().ends_with(" NO CONNECTION>")) << client()->description();
}

TEST_F(Client, TakesItsHoldsAlong) {
    const auto plugIn = server().findPlugIn(addPlugIn("a")->uuid);
    const auto other = server().findPlugIn(addPlugIn("b")->uuid);
    for (int i = 0; i < 2; ++i)
        server().addHold(std::make_shared<ZPDPlugInHold>(std::vector{plugIn}, client()));
    server().addHold(
        std::make_shared<ZPDPlugInHold>(std::vector{other}, std::weak_ptr<ZPDIpcClient>()));
    disconnect();
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_TRUE(server().holdOnPlugIn(*other)) << "nobody's hold stays";
    EXPECT_EQ(platform_.notifications.posted.size(), 5U) << "one for each made and each released";
}

TEST_F(Client, HasEntitlementsOnlyWithinARequestThatIsItsOwn) {
    platform_.signing.clientEntitlements = Dictionary{{"a", true}};
    const auto there = client();
    onServiceQueue([&] { EXPECT_FALSE(there->hasEntitlement("a")); });
}

} // namespace
