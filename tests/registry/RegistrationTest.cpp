#include <csignal>
#include <filesystem>
#include <fstream>
#include <sys/resource.h>

#include "AppRegistry/ARKeptFacts.h"
#include "AppRegistry/ARStore.h"
#include "tests/registry/RegistryFixture.h"

namespace {

constexpr const char* inside = "Applications/A.app/PlugIns/In.appex";
constexpr const char* outside = "Elsewhere/B.app/PlugIns/Out.appex";

// Writes down what it is told, and asks the registry what readers see by then.
class Witness final : public ARWorkspaceObserver {
public:
    using PlugIns = ARApplicationWorkspace::PlugIns;

    void pluginsDidInstall(const PlugIns& plugIns) override { tell('+', plugIns); }

    void pluginsWillUninstall(const PlugIns& plugIns) override { tell('-', plugIns); }

    Strings told;

private:
    void tell(char sign, const PlugIns& plugIns) {
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

// While it lives, this process can write no file, as on a full disk.
class FullDisk {
public:
    FullDisk() {
        std::signal(SIGXFSZ, SIG_IGN);
        ::getrlimit(RLIMIT_FSIZE, &before_);
        const ::rlimit none{0, before_.rlim_max};
        ::setrlimit(RLIMIT_FSIZE, &none);
    }

    ~FullDisk() { ::setrlimit(RLIMIT_FSIZE, &before_); }

private:
    ::rlimit before_{};
};

} // namespace

// Of a registry that changes without pause for as long as the box runs.
TEST_F(Registration, KeepsTheDatabaseSmallHoweverMuchChanges) {
    registry->rescan(); // after the first checkpoint
    for (int i = 0; i < 300; ++i) {
        EXPECT_FALSE(registry->registerPlugin(home / outside));
        EXPECT_FALSE(registry->unregisterPlugin(home / outside));
    }
    EXPECT_LT(std::filesystem::file_size(places.registryDatabase + "-wal"), 4U << 20);
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

    EXPECT_FALSE(registry->registerPlugin(home / outside));
    for (const char* path : {inside, outside}) {
        EXPECT_FALSE(registry->unregisterPlugin(home / path));
        home.write(std::string(path) + "/program", "other code");
    }
    reopen();
    EXPECT_EQ(identifiers(), Strings{"in"}) << "changed, while the added one is forgotten";
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

TEST_F(Registration, IsRefusedAndUndoneWhenItCannotBeStored) {
    const auto before = at(inside);
    const auto known = registry->knowledge();
    {
        const FullDisk full;
        EXPECT_TRUE(registry->registerPlugin(home / outside));
        EXPECT_TRUE(registry->unregisterPlugin(home / inside));
        EXPECT_EQ(at(inside), before);
        EXPECT_FALSE(registry->applicationProxyForBundlePath(home / "Elsewhere/B.app"));
        EXPECT_EQ(registry->knowledge().uuid, known.uuid);
        EXPECT_EQ(witness.told, Strings());
    }
    reopen();
    EXPECT_EQ(identifiers(), Strings{"in"});
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_EQ(identifiers(), (Strings{"in", "out"}));
}

TEST_F(Registration, StoresLaterWhatALookFoundOnAFullDisk) {
    {
        const FullDisk full;
        std::filesystem::rename(home / outside, home / "Applications/A.app/PlugIns/New.appex");
        std::filesystem::remove_all(home / inside);
        registry->rescan();
        EXPECT_EQ(witness.told, (Strings{"-in", "+out"}));
    }
    const auto uuid = uuidOf("Applications/A.app/PlugIns/New.appex");
    const auto known = registry->knowledge();
    EXPECT_FALSE(registry->registerPlugin(home / "Elsewhere/B.app/PlugIns/Sibling.appex"));
    EXPECT_GT(registry->knowledge().sequence, known.sequence);
    reopen();
    EXPECT_EQ(uuidOf("Applications/A.app/PlugIns/New.appex"), uuid);
    EXPECT_EQ(identifiers(), (Strings{"out", "sibling"}));
}

TEST_F(Registration, LetsAnApplicationGoWithItsLastAddedPlugIn) {
    const auto isKnown = [&](const char* path) {
        return registry->applicationProxyForBundlePath(home / path) != nullptr;
    };
    const std::string sibling = home / "Elsewhere/B.app/PlugIns/Sibling.appex";
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_FALSE(registry->registerPlugin(sibling));
    EXPECT_FALSE(registry->unregisterPlugin(home / outside));
    EXPECT_TRUE(isKnown("Elsewhere/B.app"));
    EXPECT_FALSE(registry->unregisterPlugin(sibling));
    EXPECT_FALSE(isKnown("Elsewhere/B.app"));
    EXPECT_FALSE(registry->registerPlugin(sibling));
    remove("Elsewhere/B.app/PlugIns/Sibling.appex");
    registry->rescan();
    EXPECT_FALSE(isKnown("Elsewhere/B.app"));

    // One that is refused brings none in; one in a watched folder stays, noticed or not.
    home.write("Elsewhere/B.app/PlugIns/Broken.appex/Info.plist", "broken");
    EXPECT_TRUE(registry->registerPlugin(home / "Elsewhere/B.app/PlugIns/Broken.appex"));
    EXPECT_FALSE(isKnown("Elsewhere/B.app"));
    makeApplication("Applications/C.app", "com.example.c");
    makePlugIn("Applications/C.app/PlugIns/C.appex", "c");
    for (const char* path : {inside, "Applications/C.app/PlugIns/C.appex"}) {
        EXPECT_FALSE(registry->registerPlugin(home / path));
        EXPECT_FALSE(registry->unregisterPlugin(home / path));
    }
    EXPECT_TRUE(isKnown("Applications/A.app"));
    EXPECT_TRUE(isKnown("Applications/C.app"));
    registry->rescan();
    EXPECT_EQ(identifiers(), Strings());
}

TEST_F(Registration, KeepsPathsOfAnyBytesBesideTheDatabase) {
    const std::string odd = "Elsewhere/\xff\n&<.appex";
    makePlugIn(odd, "odd");
    EXPECT_FALSE(registry->registerPlugin(home / odd));
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_FALSE(registry->unregisterPlugin(home / inside));
    registry.reset();
    const std::string file = ARFileBeside(places.registryDatabase, ARKeptFacts::fileSuffix);
    EXPECT_EQ(ARKeptFacts(file).read(),
              (ARKeptFacts::Facts{{home / odd, home / outside}, {home / inside}, {}}));
    for (const char* content :
         {"", "broken", "<plist><dict><key>version</key><integer>2</integer></dict></plist>"}) {
        std::ofstream(file) << content;
        const std::string log =
            logOf([&] { EXPECT_EQ(ARKeptFacts(file).read(), ARKeptFacts::Facts()); });
        EXPECT_NE(log.find("ignoring " + file), std::string::npos) << log;
    }
    open(); // the database still knows, and the file is well again
    EXPECT_EQ(identifiers(), (Strings{"odd", "out"}));
    EXPECT_EQ(ARKeptFacts(file).read().added.size(), 2u);
}
