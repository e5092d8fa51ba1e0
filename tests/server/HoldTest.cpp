#include "tests/server/ServerFixture.h"
#include "zpd/ZPDIpcClient.h"

namespace {

using Hold = ServerFixture;
using Posts = std::vector<std::string>;

const std::string change = "com.tovana.zephrin.annotation-change";

TEST_F(Hold, BlocksUntilItIsReleasedByToken) {
    const auto a = addPlugIn("a");
    const auto plugIn = server().findPlugIn(a->uuid);
    const auto other = server().findPlugIn(addPlugIn("b")->uuid);
    auto hold =
        std::make_shared<ZPDPlugInHold>(std::vector{plugIn, plugIn}, std::weak_ptr<ZPDIpcClient>());
    EXPECT_EQ(hold->blocked().size(), 1U);
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    server().addHold(hold);
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
        server().addHold(
            std::make_shared<ZPDPlugInHold>(std::vector{plugIn}, std::weak_ptr<ZPDIpcClient>()));
    server().stop();
    EXPECT_FALSE(server().holdOnPlugIn(*plugIn));
    EXPECT_EQ(platform_.notifications.posted, Posts(4, change));
}

} // namespace
