#include "tests/server/ServerFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;

using Lookup = ServerFixture;

TEST_F(Lookup, SkipsEveryFilterOfDiscovery) {
    const auto plugIn = addPlugIn("a");
    setKey(*plugIn, "Dedicated", true);
    setKey(*plugIn, "HXExtensionHostEntitlement", "com.example.none");
    platform_.preferences.values["com.tovana.zephrin.userprefs exclusions"] =
        Array{Dictionary{{"HXExtensionIdentifier", "a"}}};
    server().addHold(std::make_shared<ZPDPlugInHold>(std::vector{server().findPlugIn(plugIn->uuid)},
                                                     std::weak_ptr<ZPDIpcClient>()));
    EXPECT_TRUE(ask("find", {{"uuids", plugIn->uuid}})->contains("matches"));
    EXPECT_TRUE(match().empty());
}

TEST_F(Lookup, OfAVanishedBundleIsASuccessWithoutMatches) {
    const auto plugIn = addPlugIn("a");
    EXPECT_TRUE(ask("find", {{"uuids", plugIn->uuid}})->contains("matches"));
    platform_.workspace.installed.clear();
    platform_.workspace.move();
    const Reply reply = ask("find", {{"uuids", plugIn->uuid}});
    ASSERT_TRUE(reply);
    EXPECT_TRUE(reply->empty()) << describe(*reply);
}

} // namespace
