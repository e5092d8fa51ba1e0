#include <string>
#include <vector>

#include "Zephrin/ZPDaemonClient.h"
#include "tests/server/ServerFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;
using Names = std::vector<std::string>;

constexpr auto systemOnly = ZPDaemonClient::ZPDiscoverSystemOnly;
constexpr auto everything = ZPDaemonClient::ZPDiscoverAll;

class Discovery : public ServerFixture {
protected:
    void makeClientManager() {
        platform_.signing.clientEntitlements.set("com.tovana.private.zephrin.manager", true);
    }

    std::string uuidText(const std::shared_ptr<FakePlugIn>& plugIn) const {
        return plugIn->uuid.text();
    }
};

TEST_F(Discovery, OfNothingIsAnEmptyList) {
    EXPECT_TRUE(match().empty());
    platform_.workspace.failQueries = true;
    EXPECT_TRUE(match().empty()) << "also when the registry fails";
}

TEST_F(Discovery, FiltersByPlaceUnlessPrivileged) {
    addPlugIn("in-application");
    const auto alone = addPlugIn("system");
    alone->path = "/System/Library/PlugIns/system.appex";
    alone->application = nullptr;
    alone->onSystem = true;
    const auto home = addPlugIn("home-system");
    home->path = "/System/Library/PlugIns/home.appex";
    home->application = nullptr;
    makeClientManager();
    EXPECT_EQ(names(match()), (Names{"in-application 1", "system 1"}));
    EXPECT_EQ(names(match(systemOnly)), Names{"system 1"});
    EXPECT_EQ(match(everything).size(), 3U);
    EXPECT_EQ(match(everything | systemOnly).size(), 3U) << "counts only without the other";
}

TEST_F(Discovery, OfEverythingIsRefusedToAConfinedManager) {
    makeClientManager();
    platform_.sandbox.confined = true;
    EXPECT_EQ(failureOf({{"version", 3}, {"request", "match"}, {"flags", everything}}),
              "11 unauthorized discovery flag (ZPDiscoverAll)");
    platform_.sandbox.confined = false;
    EXPECT_EQ(failureOf({{"version", 3}, {"request", "match"}, {"flags", everything}}), "");
}

TEST_F(Discovery, ShowsDedicatedPlugInsToTheirOwnApplicationOnly) {
    const std::string application = folder_ / "Client.app";
    folder_.write("Client.app/Info.plist",
                  "<plist version=\"1.0\"><dict><key>BQBundleExecutable</key>"
                  "<string>client</string></dict></plist>");
    platform_.processes.paths[::getpid()] = folder_.write("Client.app/client", "");
    folder_.write("Client.app/PlugIns/mine.appex/Info.plist", "");
    const auto mine = addPlugIn("mine");
    mine->path = application + "/PlugIns/mine.appex";
    setKey(*mine, "Dedicated", true);
    const auto others = addPlugIn("others");
    setKey(*others, "Dedicated", 1);
    setKey(*addPlugIn("not-dedicated"), "Dedicated", "yes");
    makeClientManager();
    EXPECT_EQ(names(match()), (Names{"mine 1", "not-dedicated 1"}));
    EXPECT_EQ(match(everything).size(), 3U);
}

TEST_F(Discovery, LeavesOutWhatIsOnHold) {
    addPlugIn("a");
    const auto held = addPlugIn("b");
    makeClientManager();
    const auto hold = std::make_shared<ZPDPlugInHold>(std::vector{server().findPlugIn(held->uuid)},
                                                      std::weak_ptr<ZPDIpcClient>());
    server().addHold(hold);
    EXPECT_EQ(names(match()), Names{"a 1"});
    EXPECT_EQ(match(everything).size(), 2U);
    server().unholdToken(hold->uuid());
    EXPECT_EQ(match().size(), 2U);
}

TEST_F(Discovery, LeavesOutTheUsersExclusionsEvenForManagers) {
    addPlugIn("a");
    addPlugIn("b");
    makeClientManager();
    platform_.preferences.values["com.tovana.zephrin.userprefs exclusions"] =
        Array{Dictionary{{"HXExtensionIdentifier", Array{"x", "a"}}}};
    EXPECT_EQ(names(match(everything)), Names{"b 1"});
}

TEST_F(Discovery, AsksEachPlugInWhetherTheClientMayUseIt) {
    addPlugIn("a");
    setKey(*addPlugIn("b"), "HXExtensionHostEntitlement", "com.example.held");
    setKey(*addPlugIn("c"), "HXExtensionHostEntitlement", "com.example.not-held");
    platform_.signing.clientEntitlements.set("com.example.held", "no");
    platform_.signing.clientEntitlements.set("com.example.not-held", 0);
    makeClientManager();
    EXPECT_EQ(names(match()), (Names{"a 1", "b 1"}));
    EXPECT_EQ(match(everything).size(), 3U);
}

TEST_F(Discovery, TakesTheContainingPathAsALiteralPrefixAndTheLastOfSeveral) {
    const auto first = addPlugIn("x", "2");
    first->application->path = "/Applications/Client.app";
    const auto last = addPlugIn("x", "1");
    last->application->path = "/Applications/Cli";
    makeClientManager();
    for (const std::uint64_t flags : {std::uint64_t{0}, everything})
        EXPECT_EQ(names(match(flags)), Names{"x 1"}) << flags;
}

TEST_F(Discovery, MarksReplacements) {
    addPlugIn("x");
    const auto replacing = addPlugIn("z");
    replacing->granted = Dictionary{{"com.tovana.developer.replace-plugin", "x"}};
    const Forms forms = match();
    ASSERT_EQ(names(forms), (Names{"x 1", "z 1"}));
    EXPECT_EQ(textIn(forms[0], "overrider"), uuidText(replacing));
    EXPECT_FALSE(forms[0].contains("overriding"));
    EXPECT_EQ(textIn(forms[1], "overriding"), "x");
    EXPECT_FALSE(forms[1].contains("overrider"));
    EXPECT_EQ(names(match(0, {{"rules", Dictionary{{"HXExtensionIdentifier", "x"}}}})),
              Names{"x 1"});
}

TEST_F(Discovery, TakesAnArrayOfReplacementsAndTheLastWordOfSeveral) {
    addPlugIn("x");
    addPlugIn("y");
    const char* const key = "com.tovana.developer.replace-plugin";
    const auto first = addPlugIn("r");
    first->granted = Dictionary{{key, Array{"x", 5, "y", "absent"}}};
    const auto last = addPlugIn("s");
    last->granted = Dictionary{{key, "y"}};
    addPlugIn("t")->granted = Dictionary{{key, true}};
    const auto own = addPlugIn("self");
    own->granted = Dictionary{{key, "self"}};
    const Forms forms = match();
    ASSERT_EQ(forms.size(), 6U);
    EXPECT_EQ(textIn(forms[0], "overrider"), uuidText(first));
    EXPECT_EQ(textIn(forms[1], "overrider"), uuidText(last));
    EXPECT_EQ(textIn(forms[2], "overriding"), "x");
    EXPECT_EQ(textIn(forms[3], "overriding"), "y");
    EXPECT_FALSE(forms[4].contains("overriding"));
    EXPECT_EQ(textIn(forms[5], "overriding"), "self");
    EXPECT_EQ(textIn(forms[5], "overrider"), uuidText(own));
}

TEST_F(Discovery, RemembersReplacementsOfDisplacedRegistrations) {
    addPlugIn("x");
    const auto displaced = addPlugIn("r", "1");
    displaced->granted = Dictionary{{"com.tovana.developer.replace-plugin", "x"}};
    addPlugIn("r", "2");
    const auto discarded = addPlugIn("r", "1");
    discarded->granted = Dictionary{{"com.tovana.developer.replace-plugin", "r"}};
    const Forms forms = match();
    ASSERT_EQ(names(forms), (Names{"x 1", "r 2"}));
    EXPECT_EQ(textIn(forms[0], "overrider"), uuidText(displaced));
    EXPECT_FALSE(forms[1].contains("overriding"));
    EXPECT_FALSE(forms[1].contains("overrider")) << "a discarded one declares nothing";
}

TEST_F(Discovery, SkipsAPlugInWhoseBundleVanished) {
    addPlugIn("a");
    const auto vanishing = std::make_shared<FakePlugIn>(*addPlugIn("b"));
    EXPECT_EQ(match().size(), 2U);
    vanishing->info = std::nullopt;
    platform_.workspace.installed.back() = vanishing;
    platform_.workspace.move();
    EXPECT_EQ(names(match()), Names{"a 1"});
}

} // namespace
