#include "tests/e2e/DaemonTest.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr unsigned allVersions = 0x1;
constexpr unsigned allDuplicates = 0x4;
constexpr unsigned systemOnly = 0x8;

Item only(const char* identifier) {
    return Item::map({{"HXExtensionIdentifier", identifier}});
}

using Discovery = DaemonTest;

TEST_F(Discovery, KeepsOneRegistrationOfAnIdentifier) {
    int number = 0;
    const auto add = [&](const char* identifier, const char* version,
                         const char* folder = "Applications") {
        addAppWith(home, "App" + std::to_string(number++),
                   {.identifier = identifier, .version = version}, folder);
    };
    add("many", "1.9");
    add("many", "1.10");
    add("many", "1.9");
    add("equal", "1.0");
    add("equal", "1.0", "System/Applications");
    add("newer", "2.0");
    add("newer", "1.0", "System/Applications");
    addAppWith(
        home, "Versionless",
        {.identifier = "none", .attributes = Item::map({{"HXExtensionVersion", Item::array({})}})});
    add("none", "9.0");
    start();

    const std::tuple<const char*, unsigned, const char*> cases[] = {
        {"many", 0, "many 1.10"},
        {"many", allVersions, "many 1.10, many 1.9"},
        {"many", allDuplicates, "many 1.10"},
        {"many", allVersions | allDuplicates, "many 1.10, many 1.9, many 1.9"},
        {"many", systemOnly, ""},
        {"newer", 0, "newer 2.0"},
        {"newer", systemOnly, "newer 1.0"},
        {"none", 0, "none <none>"}};
    for (const auto& [identifier, flags, answer] : cases)
        EXPECT_EQ(versions(*client, only(identifier), flags), answer) << identifier << flags;
    const std::vector<Item> kept = match(*client, only("equal"));
    ASSERT_EQ(kept.size(), 1u);
    EXPECT_EQ(kept[0]["systemResident"], Item(true)); // preferred among equal versions
    EXPECT_TRUE(daemon->logs("ops info: Candidate plugin count: 9, info: "));
    EXPECT_TRUE(daemon->logs("ops info: Resulting plugin count: 1, UUIDs: "));
    EXPECT_TRUE(daemon->logs("equal(1.0) " + kept[0]["uuid"].text()));
}

TEST_F(Discovery, LeavesOutWhatTheUserExcluded) {
    home.addAppWithPlugIns("Some", {"a", "b", "c", "d"});
    start();
    const std::string file = home / "etc/Preferences/com.tovana.zephrin.userprefs.plist";
    const auto leaves = [&](const Item& exclusions) {
        writeFile(file, xmlPlist(Item::map({{"exclusions", exclusions}})));
        return seen();
    };
    EXPECT_EQ(seen(), "a b c d");
    EXPECT_EQ(leaves(Item::array({only("a"), "junk", only(">c")})), "b c");
    EXPECT_TRUE(daemon->logs(" globally excluded"));
    EXPECT_EQ(leaves(only("a")), "a b c d");
    EXPECT_EQ(leaves(Item::array({Item::map({})})), "");
    writeFile(file, "<plist>junk");
    EXPECT_EQ(seen(), "a b c d");
    writeFile(file + ".new", xmlPlist(Item::map({{"exclusions", Item::array({only("b")})}})));
    fs::rename(file + ".new", file);
    EXPECT_EQ(seen(), "a c d");
    fs::remove_all(home / "etc/Preferences");
    EXPECT_EQ(seen(), "a b c d");
}

TEST_F(Discovery, LeavesOutWhatThisClientMayNotUse) {
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const char* key, const Item& value) {
        addPlugIn(app, identifier,
                  {.identifier = identifier, .extension = Item::map({{key, value}})});
    };
    add("a", "Dedicated", "true");
    add("b", "Dedicated", 1);
    add("c", "HXExtensionHostEntitlement", "com.x");
    add("d", "HXExtensionHostEntitlement", 5);
    writeFile(home.addAppWithPlugIns("Coming", {"e"}) + "/.installing", "");
    start();
    EXPECT_EQ(seen(), "a");
    EXPECT_TRUE(daemon->logs(": the host does not have the \"com.x\" entitlement"));
    EXPECT_TRUE(daemon->logs("because its app is a placeholder"));
    // A look-up passes over what discovery filters.
    EXPECT_EQ(findAt(*client, app + "/PlugIns/b.appex")["identifier"], Item("b"));
}

// Makes an application whose executable is a program of ours.
std::string addHost(const Home& home, const std::string& name) {
    std::string app = home.addApp(name);
    addProgram(app + "/" + name);
    return app;
}

TEST_F(Discovery, HidesOtherRegistrationsOfTheClientsOwnPlugIns) {
    const std::string app = addHost(home, "Host");
    const std::string longer = addHost(home, "Host.app2");
    const std::string mine = addPlugIn(app, "Mine", {.identifier = "shared"});
    const std::string theirs =
        addAppWith(home, "Other", {.identifier = "shared", .version = "2.0"});
    start();
    const std::tuple<const char*, std::string, const char*, std::string> cases[] = {
        {"a program of no bundle", addProgram(home / "probe"), "paths 0", theirs},
        {"the application itself", app + "/Host", "paths 0", mine},
        {"the application asking for all versions", app + "/Host", "paths 5", mine},
        {"an application whose path begins like it", longer + "/Host.app2", "paths 0", mine}};
    for (const auto& [what, program, question, answer] : cases) {
        Talk talk(home, {program, daemon->socketPath(), "connect", "listen", question});
        EXPECT_EQ(talk.hear(), answer) << what;
    }
    EXPECT_TRUE(daemon->logs(" @ '" + theirs + "' in favor of bundle-relative '" + mine + "'"));
}

} // namespace
} // namespace e2e
