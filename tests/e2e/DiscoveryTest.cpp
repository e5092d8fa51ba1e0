#include <filesystem>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

constexpr unsigned allVersions = 0x1;
constexpr unsigned allDuplicates = 0x4;
constexpr unsigned systemOnly = 0x8;

Item only(const char* identifier) {
    return Item::map({{"HXExtensionIdentifier", identifier}});
}

TEST(Discovery, KeepsOneRegistrationOfAnIdentifier) {
    const Home home;
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
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();

    struct Case {
        const char* identifier;
        unsigned flags;
        const char* answer;
    };

    const std::vector<Case> cases = {
        {"many", 0, "many 1.10"},
        {"many", allVersions, "many 1.10, many 1.9"},
        {"many", allDuplicates, "many 1.10"},
        {"many", allVersions | allDuplicates, "many 1.10, many 1.9, many 1.9"},
        {"many", systemOnly, ""},
        {"newer", 0, "newer 2.0"},
        {"newer", systemOnly, "newer 1.0"},
        {"none", 0, "none <none>"}};
    for (const Case& each : cases) {
        SCOPED_TRACE(std::string(each.identifier) + " with flags " + std::to_string(each.flags));
        EXPECT_EQ(versions(client, only(each.identifier), each.flags), each.answer);
    }
    const std::vector<Item> kept = match(client, only("equal"));
    ASSERT_EQ(kept.size(), 1u);
    EXPECT_EQ(kept[0]["systemResident"], Item(true)); // preferred among equal versions
    EXPECT_TRUE(daemon.logs("ops info: Candidate plugin count: 9, info: "));
    EXPECT_TRUE(daemon.logs("ops info: Resulting plugin count: 1, UUIDs: "));
    EXPECT_TRUE(daemon.logs("equal(1.0) " + kept[0]["uuid"].text()));
}

TEST(Discovery, LeavesOutWhatTheUserExcluded) {
    const Home home;
    const std::string app = home.addApp("Some");
    for (const char* identifier : {"a", "b", "c", "d"})
        addPlugIn(app, identifier, {.identifier = identifier});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::string file = home / "etc/Preferences/com.tovana.zephrin.userprefs.plist";
    const auto leaves = [&](const Item& exclusions) {
        writeFile(file, xmlPlist(Item::map({{"exclusions", exclusions}})));
        return matched(client, Item::map({}));
    };
    EXPECT_EQ(matched(client, Item::map({})), "a b c d");
    EXPECT_EQ(leaves(Item::array({only("a"), "junk", only(">c")})), "b c");
    EXPECT_TRUE(daemon.logs(" globally excluded"));
    EXPECT_EQ(leaves(only("a")), "a b c d");
    EXPECT_EQ(leaves(Item::array({Item::map({})})), "");
    writeFile(file, "<plist>junk");
    EXPECT_EQ(matched(client, Item::map({})), "a b c d");
    writeFile(file + ".new", xmlPlist(Item::map({{"exclusions", Item::array({only("b")})}})));
    std::filesystem::rename(file + ".new", file);
    EXPECT_EQ(matched(client, Item::map({})), "a c d");
    std::filesystem::remove_all(home / "etc/Preferences");
    EXPECT_EQ(matched(client, Item::map({})), "a b c d");
}

TEST(Discovery, LeavesOutWhatThisClientMayNotUse) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const char* key, const Item& value) {
        addPlugIn(app, identifier,
                  {.identifier = identifier, .extension = Item::map({{key, value}})});
    };
    add("a", "Dedicated", "true");
    add("b", "Dedicated", 1);
    add("c", "HXExtensionHostEntitlement", "com.x");
    add("d", "HXExtensionHostEntitlement", 5);
    const std::string placeholder = home.addApp("Coming");
    addPlugIn(placeholder, "e", {.identifier = "e"});
    writeFile(placeholder + "/.installing", "");
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "a");
    EXPECT_TRUE(daemon.logs(": the host does not have the \"com.x\" entitlement"));
    EXPECT_TRUE(daemon.logs("because its app is a placeholder"));
    // A look-up passes over what discovery filters.
    EXPECT_EQ(findAt(client, app + "/PlugIns/b.appex")["identifier"], Item("b"));
}

} // namespace
} // namespace e2e
