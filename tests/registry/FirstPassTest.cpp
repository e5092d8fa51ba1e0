#include <functional>

#include "tests/registry/RegistryFixture.h"

using platform::Dictionary;
using platform::Uuid;

namespace {

constexpr const char* one = "Applications/A.app/PlugIns/One.appex";
constexpr const char* two = "Applications/A.app/PlugIns/Two.appex";

class FirstPass : public RegistryTest {
protected:
    FirstPass() {
        makeApplication("Applications/A.app", "com.example.a");
        makePlugIn(one, "com.example.a.one");
        makePlugIn(two, "com.example.a.two");
        letClockTick();
    }
};

} // namespace

TEST_F(FirstPass, FindsPlugInsInApplicationsAndBesidesThem) {
    makePlugIn("Elsewhere/Alone.appex", "com.example.alone");
    makeApplication("System/Applications/S.app", "com.example.s");
    makePlugIn("System/Applications/S.app/PlugIns/In.appex", "com.example.s.in");
    makePlugIn("Applications/A.app/PlugIns/.Hidden.appex", "com.example.hidden");
    places.plugInFolders.push_back(home / "Elsewhere");
    open();
    EXPECT_EQ(identifiers(), (Strings{"com.example.a.one", "com.example.a.two", "com.example.s.in",
                                      "com.example.alone"}));

    const auto plugIn = at(one);
    EXPECT_EQ(registry->zephrinProxyForUUID(plugIn->plugInUUID()), plugIn);
    EXPECT_EQ(plugIn->originalIdentifier(), "com.example.a.one");
    EXPECT_EQ(plugIn->bundleVersion(), "1.0");
    EXPECT_EQ(plugIn->containingBundle()->bundleIdentifier(), "com.example.a");
    EXPECT_FALSE(plugIn->isOnSystemPartition());
    EXPECT_EQ(plugIn->dataContainerPath(), places.containers + "/com.example.a.one");
    EXPECT_FALSE(at("Elsewhere/Alone.appex")->containingBundle());
    EXPECT_TRUE(at("System/Applications/S.app/PlugIns/In.appex")->isOnSystemPartition());

    const auto application = registry->applicationProxyForBundlePath(home / "Applications/A.app");
    EXPECT_EQ(application->zephrinPlugins(), (std::vector{at(one), at(two)}));
}

TEST_F(FirstPass, TakesTheIdentifierFromTheExtensionThenTheTopThenTheBundle) {
    Dictionary info = plugInInfo("com.example.bundle", "p");
    const auto identifier = [&](std::string_view path) {
        makeBundle(path, info);
        open();
        return *at(path)->plugInIdentifier();
    };
    EXPECT_EQ(identifier("Applications/A.app/PlugIns/1.appex"), "com.example.bundle");
    info.set("HXExtensionIdentifier", "com.example.top");
    EXPECT_EQ(identifier("Applications/A.app/PlugIns/2.appex"), "com.example.top");
    info.set("HXExtension", Dictionary{{"HXExtensionIdentifier", "com.example.extension"}});
    EXPECT_EQ(identifier("Applications/A.app/PlugIns/3.appex"), "com.example.extension");
}

TEST_F(FirstPass, TellsATouchedBundleFromAChangedOne) {
    const std::string program = std::string(one) + "/program";
    const std::string signature = std::string(one) + "/Signature";
    const std::tuple<const char*, std::function<void()>, bool> cases[] = {
        {"the same bytes written again", [&] { home.write(program, "code of com.example.a.one"); },
         false},
        {"a copy in place of the file",
         [&] {
             std::filesystem::copy_file(home / program, home / "copy");
             std::filesystem::rename(home / "copy", home / program);
         },
         false},
        {"other bytes of the same length",
         [&] { home.write(program, "CODE of com.example.a.one"); }, true},
        {"a signature", [&] { home.write(signature, "signed"); }, true},
        {"another signature", [&] { home.write(signature, "SIGNED"); }, true},
        {"no signature", [&] { std::filesystem::remove(home / signature); }, true},
        {"a file that does not count", [&] { home.write(std::string(one) + "/data", "x"); }, false},
    };
    open();
    for (const auto& [what, act, changed] : cases) {
        SCOPED_TRACE(what);
        const Uuid before = uuidOf(one);
        const Uuid other = uuidOf(two);
        const ARKnowledge known = registry->knowledge();
        letClockTick();
        act();
        open();
        EXPECT_EQ(uuidOf(one) != before, changed);
        EXPECT_EQ(uuidOf(two), other);
        EXPECT_EQ(registry->knowledge().sequence > known.sequence, changed);
        EXPECT_EQ(registry->knowledge().uuid != known.uuid, changed);
    }
}

TEST_F(FirstPass, SeesAChangeOfTheSameSizeRightAfterItRead) {
    for (int round = 0; round < 20; ++round) {
        home.write(std::string(one) + "/program", "A" + std::to_string(100 + round));
        open();
        const Uuid uuid = uuidOf(one);
        home.write(std::string(one) + "/program", "B" + std::to_string(100 + round));
        open();
        ASSERT_NE(uuidOf(one), uuid);
    }
}

TEST_F(FirstPass, KeepsTheFirstIdentifierOfAPath) {
    open();
    makePlugIn(one, "com.example.renamed");
    open();
    EXPECT_EQ(at(one)->plugInIdentifier(), "com.example.renamed");
    EXPECT_EQ(at(one)->originalIdentifier(), "com.example.a.one");
    open();
    EXPECT_EQ(at(one)->originalIdentifier(), "com.example.a.one");
}

TEST_F(FirstPass, ForgetsWhatVanished) {
    open();
    const ARKnowledge known = registry->knowledge();
    remove(one);
    open();
    EXPECT_EQ(identifiers(), Strings{"com.example.a.two"});
    EXPECT_GT(registry->knowledge().sequence, known.sequence);
    remove("Applications/A.app");
    open();
    EXPECT_EQ(identifiers(), Strings());
    EXPECT_FALSE(registry->applicationProxyForBundlePath(home / "Applications/A.app"));
}

TEST_F(FirstPass, RegistersOnceWhatIsReachedTwice) {
    std::filesystem::create_directory_symlink(home / "Applications/A.app",
                                              home / "Applications/Z.app");
    std::filesystem::create_directory_symlink(home / one,
                                              home / "Applications/A.app/PlugIns/Again.appex");
    makeApplication("Real/B.app", "com.example.b");
    makePlugIn("Real/B.app/PlugIns/In.appex", "com.example.b.in");
    std::filesystem::create_directory_symlink(home / "Real/B.app", home / "Applications/B.app");
    places.applicationFolders.push_back(places.applicationFolders.front() + "/");
    const std::string log = open();
    EXPECT_EQ(identifiers(),
              (Strings{"com.example.a.one", "com.example.a.two", "com.example.b.in"}));
    EXPECT_TRUE(at("Real/B.app/PlugIns/In.appex")->containingBundle());
    EXPECT_EQ(log, "");
    std::filesystem::create_symlink(home / "nowhere", home / "Applications/Dangling.app");
    std::filesystem::create_symlink("Loop.app", home / "Applications/Loop.app");
    std::filesystem::create_directory_symlink(home / one, home / "Applications/0.app"); // no app
    const Uuid uuid = uuidOf(one);
    open();
    EXPECT_EQ(identifiers().size(), 3U);
    EXPECT_EQ(uuidOf(one), uuid);
}
