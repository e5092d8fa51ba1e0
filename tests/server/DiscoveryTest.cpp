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

    void addReplacing(const char* identifier, platform::Value replaced) {
        addPlugIn(identifier)->granted =
            Dictionary{{"com.tovana.developer.replace-plugin", std::move(replaced)}};
    }

    // "identifier version", "for" what it replaces, "by" the number of the plug-in that replaces
    // it.
    Names replacements() {
        const Forms forms = match();
        Names result = names(forms);
        for (std::size_t i = 0; i < forms.size(); ++i) {
            if (forms[i].contains("overriding"))
                result[i] += " for " + textIn(forms[i], "overriding");
            const auto& all = platform_.workspace.installed;
            for (std::size_t by = 0; by < all.size(); ++by) {
                if (all[by]->plugInUUID().text() == textIn(forms[i], "overrider"))
                    result[i] += " by " + std::to_string(by);
            }
            EXPECT_EQ(result[i].contains(" by "), forms[i].contains("overrider"));
        }
        return result;
    }

    ZPDPlugInHold::Ptr hold(const FakePlugIn& plugIn) {
        auto hold = std::make_shared<ZPDPlugInHold>(std::vector{server().findPlugIn(plugIn.uuid)},
                                                    std::weak_ptr<ZPDIpcClient>());
        EXPECT_FALSE(server().addHold(hold));
        return hold;
    }

    void exclude(platform::Value identifiers) {
        platform_.preferences.values["com.tovana.zephrin.userprefs exclusions"] =
            Array{Dictionary{{"HXExtensionIdentifier", std::move(identifiers)}}};
    }
};

TEST_F(Discovery, OfNothingIsAnEmptyList) {
    EXPECT_TRUE(match().empty());
    platform_.workspace.failQueries = true;
    EXPECT_TRUE(match().empty()) << "also when the registry fails";
}

TEST_F(Discovery, FiltersByPlaceUnlessPrivileged) {
    addPlugIn("in-application");
    for (const bool system : {true, false}) {
        const auto alone = addPlugIn(system ? "system" : "home-system");
        alone->path = "/System/Library/PlugIns/" + *alone->identifier + ".appex";
        alone->application = nullptr;
        alone->onSystem = system;
    }
    makeClientManager();
    EXPECT_EQ(names(match()), (Names{"in-application 1", "system 1"}));
    EXPECT_EQ(names(match(systemOnly)), Names{"system 1"});
    EXPECT_EQ(match(everything).size(), 3U);
    EXPECT_EQ(match(everything | systemOnly).size(), 3U) << "counts only without the other";
}

TEST_F(Discovery, OfEverythingIsRefusedToAConfinedManager) {
    makeClientManager();
    platform_.sandbox.confined = true;
    const Dictionary request{{"version", 3}, {"request", "match"}, {"flags", everything}};
    EXPECT_EQ(failureOf(request), "11 unauthorized discovery flag (ZPDiscoverAll)");
    platform_.sandbox.confined = false;
    EXPECT_EQ(failureOf(request), "");
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

TEST_F(Discovery, LeavesOutWhatIsOnHoldOrNotForThisClient) {
    addPlugIn("a");
    const auto onHold = hold(*addPlugIn("b"));
    setKey(*addPlugIn("c"), "HXExtensionHostEntitlement", "com.example.held");
    setKey(*addPlugIn("d"), "HXExtensionHostEntitlement", "com.example.not-held");
    platform_.signing.clientEntitlements.set("com.example.held", "no");
    platform_.signing.clientEntitlements.set("com.example.not-held", 0);
    makeClientManager();
    EXPECT_EQ(names(match()), (Names{"a 1", "c 1"}));
    EXPECT_EQ(match(everything).size(), 4U);
    server().unholdToken(onHold->uuid());
    EXPECT_EQ(names(match()), (Names{"a 1", "b 1", "c 1"}));
}

TEST_F(Discovery, LeavesOutTheUsersExclusionsEvenForManagers) {
    addPlugIn("a");
    addPlugIn("b");
    makeClientManager();
    exclude(Array{"x", "a"});
    EXPECT_EQ(names(match(everything)), Names{"b 1"});
}

TEST_F(Discovery, IsNotInTheWayOfALookUp) {
    const auto plugIn = addPlugIn("a");
    setKey(*plugIn, "Dedicated", true);
    setKey(*plugIn, "HXExtensionHostEntitlement", "com.example.none");
    exclude("a");
    hold(*plugIn);
    EXPECT_TRUE(ask("find", {{"uuids", plugIn->uuid}})->contains("matches"));
    EXPECT_TRUE(match().empty());
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
    addReplacing("z", "x");
    EXPECT_EQ(replacements(), (Names{"x 1 by 1", "z 1 for x"}));
    EXPECT_EQ(names(match(0, {{"rules", Dictionary{{"HXExtensionIdentifier", "x"}}}})),
              Names{"x 1"});
}

TEST_F(Discovery, TakesAnArrayOfReplacementsAndTheLastWordOfSeveral) {
    addPlugIn("x");
    addPlugIn("y");
    addReplacing("r", Array{"x", 5, "y", "absent"});
    addReplacing("s", "y");
    addReplacing("t", true);
    addReplacing("self", "self");
    EXPECT_EQ(replacements(), (Names{"x 1 by 2", "y 1 by 3", "r 1 for x", "s 1 for y", "t 1",
                                     "self 1 for self by 5"}));
}

TEST_F(Discovery, RemembersReplacementsOfDisplacedRegistrations) {
    addPlugIn("x");
    addReplacing("r", "x");
    addPlugIn("r", "2");
    addReplacing("r", "r"); // discarded, and so declares nothing
    EXPECT_EQ(replacements(), (Names{"x 1 by 1", "r 2"}));
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

TEST_F(Discovery, LooksUpAVanishedBundleWithoutMatches) {
    const Dictionary request{{"uuids", addPlugIn("a")->uuid}};
    EXPECT_TRUE(ask("find", request)->contains("matches"));
    platform_.workspace.installed.clear();
    platform_.workspace.move();
    const Reply reply = ask("find", request);
    ASSERT_TRUE(reply);
    EXPECT_TRUE(reply->empty()) << describe(*reply);
}

} // namespace
