#include "tests/registry/RegistryFixture.h"

using Strings = std::vector<std::string>;

namespace {

constexpr const char* inside = "Applications/A.app/PlugIns/In.appex";
constexpr const char* outside = "Elsewhere/B.app/PlugIns/Out.appex";

// Writes down what it is told, and asks the registry what readers see by then.
class Witness final : public ARWorkspaceObserver {
public:
    void pluginsDidInstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) override {
        tell('+', plugIns);
    }

    void pluginsWillUninstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) override {
        tell('-', plugIns);
    }

    Strings told;

private:
    void tell(char sign, const std::vector<ARZephrinProxy::Ptr>& plugIns) {
        for (const auto& plugIn : plugIns)
            told.push_back(sign + *plugIn->plugInIdentifier());
    }
};

class Registration : public RegistryTest {
protected:
    void SetUp() override {
        makeApplication("Applications/A.app", "com.example.a");
        makePlugIn(inside, "in");
        makeApplication("Elsewhere/B.app", "com.example.b");
        makePlugIn(outside, "out");
        makePlugIn("Elsewhere/B.app/PlugIns/Sibling.appex", "sibling");
        reopen();
    }

    void reopen() {
        open();
        registry->setObserver(&witness);
        witness.told.clear();
    }

    Witness witness;
};

} // namespace

TEST_F(Registration, AddsABundleByPathForGood) {
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_EQ(identifiers(), (Strings{"in", "out"}));
    EXPECT_EQ(at(outside)->containingBundle()->bundleIdentifier(), "com.example.b");
    EXPECT_EQ(witness.told, Strings{"+out"});
    const auto uuid = uuidOf(outside);
    const auto known = registry->knowledge();

    EXPECT_FALSE(registry->registerPlugin(home / outside)); // nothing new
    EXPECT_EQ(witness.told, Strings{"+out"});
    EXPECT_EQ(registry->knowledge().uuid, known.uuid);

    reopen();
    EXPECT_EQ(identifiers(), (Strings{"in", "out"}));
    EXPECT_EQ(uuidOf(outside), uuid);
    remove("Elsewhere");
    reopen();
    EXPECT_EQ(identifiers(), Strings{"in"});
}

TEST_F(Registration, RefusesWhatIsNoPlugIn) {
    home.write("Elsewhere/Broken.appex/Info.plist", "broken");
    makePlugIn("Elsewhere/Other.bundle", "other");
    for (const char* path : {"Elsewhere/Missing.appex", "Elsewhere/Broken.appex",
                             "Elsewhere/Other.bundle", "Elsewhere/B.app"}) {
        EXPECT_TRUE(registry->registerPlugin(home / path)) << path;
        EXPECT_TRUE(registry->unregisterPlugin(home / path)) << path;
    }
    EXPECT_EQ(identifiers(), Strings{"in"});
    EXPECT_EQ(witness.told, Strings());
}

TEST_F(Registration, KeepsAwayWhatWasTakenAway) {
    const auto uuid = uuidOf(inside);
    EXPECT_FALSE(registry->unregisterPlugin(home / inside));
    EXPECT_EQ(identifiers(), Strings());
    EXPECT_EQ(witness.told, Strings{"-in"});
    EXPECT_FALSE(registry->zephrinProxyForUUID(uuid));
    EXPECT_TRUE(registry->unregisterPlugin(home / inside));
    registry->rescan();
    EXPECT_EQ(identifiers(), Strings());
    reopen();
    EXPECT_EQ(identifiers(), Strings());

    EXPECT_FALSE(registry->registerPlugin(home / inside));
    EXPECT_EQ(identifiers(), Strings{"in"});
    EXPECT_NE(uuidOf(inside), uuid);
    EXPECT_EQ(witness.told, Strings{"+in"});

    EXPECT_FALSE(registry->unregisterPlugin(home / inside)); // until it changes
    home.write(std::string(inside) + "/program", "other code");
    reopen();
    EXPECT_EQ(identifiers(), Strings{"in"});
}

TEST_F(Registration, ForgetsAnAddedBundleThatIsTakenAway) {
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_FALSE(registry->unregisterPlugin(home / outside));
    home.write(std::string(outside) + "/program", "other code");
    reopen();
    EXPECT_EQ(identifiers(), Strings{"in"});
}

TEST_F(Registration, TellsOfChangesThatALookFinds) {
    letClockTick();
    reopen();
    const auto before = at(inside);
    makePlugIn("Applications/A.app/PlugIns/New.appex", "new");
    registry->rescan();
    EXPECT_EQ(witness.told, Strings{"+new"});
    EXPECT_EQ(at(inside), before); // the very same object
    home.write(std::string(inside) + "/program", "other code");
    registry->rescan();
    EXPECT_EQ(witness.told, (Strings{"+new", "-in", "+in"}));
    remove("Applications/A.app");
    registry->rescan();
    EXPECT_EQ(identifiers(), Strings());
    EXPECT_EQ(*before->plugInIdentifier(), "in");
}

TEST_F(Registration, KeepsProxiesWhenFilesWereOnlyTouched) {
    const auto before = at(inside);
    makeApplication("Applications/A.app", "com.example.a"); // the same bytes again
    makePlugIn(inside, "in");
    registry->rescan();
    EXPECT_EQ(at(inside), before);
    EXPECT_EQ(witness.told, Strings());
}

TEST_F(Registration, RenewsPlugInsWhoseApplicationChanged) {
    const auto before = at(inside);
    makeApplication("Applications/A.app", "com.example.renamed");
    registry->rescan();
    EXPECT_NE(at(inside), before);
    EXPECT_EQ(uuidOf(inside), before->plugInUUID());
    EXPECT_EQ(at(inside)->containingBundle()->bundleIdentifier(), "com.example.renamed");
    EXPECT_EQ(
        registry->applicationProxyForBundlePath(home / "Applications/A.app")->zephrinPlugins(),
        std::vector{at(inside)});
    EXPECT_EQ(witness.told, Strings());
}
