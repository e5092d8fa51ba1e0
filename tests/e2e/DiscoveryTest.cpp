#include <thread>

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
const char* const systemFolder = "System/Applications";

Item only(const char* identifier) {
    return Item::map({{"HXExtensionIdentifier", identifier}});
}

struct Case {
    const char* identifier;
    unsigned flags;
    const char* answer;
};

void expectVersions(WireClient& client, const std::vector<Case>& cases) {
    for (const Case& each : cases) {
        SCOPED_TRACE(std::string(each.identifier) + " with flags " + std::to_string(each.flags));
        EXPECT_EQ(versions(client, only(each.identifier), each.flags), each.answer);
    }
}

TEST(Discovery, KeepsOneRegistrationOfAnIdentifier) {
    const Home home;
    int number = 0;
    const auto add = [&](const char* identifier, const char* version) {
        addAppWith(home, "App" + std::to_string(number++),
                   {.identifier = identifier, .version = version});
    };
    add("up", "1.9");
    add("up", "1.10");
    add("down", "2.0");
    add("down", "1.0");
    add("equal", "1.0");
    add("equal", "1.0");
    add("zeros", "1.0");
    add("zeros", "1.00");
    add("many", "1.0");
    add("many", "3.0");
    add("many", "1.0");
    add("many", "2.0");
    addAppWith(
        home, "Versionless",
        {.identifier = "none", .attributes = Item::map({{"HXExtensionVersion", Item::array({})}})});
    add("none", "9.0");
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    expectVersions(client,
                   {{"up", 0, "up 1.10"},
                    {"up", allVersions, "up 1.10, up 1.9"},
                    {"up", allDuplicates, "up 1.10"},
                    {"down", 0, "down 2.0"},
                    {"equal", 0, "equal 1.0"},
                    {"equal", allVersions, "equal 1.0"},
                    {"equal", allDuplicates, "equal 1.0"},
                    {"equal", allVersions | allDuplicates, "equal 1.0, equal 1.0"},
                    {"many", 0, "many 3.0"},
                    {"many", allVersions, "many 1.0, many 2.0, many 3.0"},
                    {"many", allVersions | allDuplicates, "many 1.0, many 1.0, many 2.0, many 3.0"},
                    {"none", 0, "none <none>"},
                    {"none", allVersions, "none 9.0, none <none>"}});
    EXPECT_EQ(match(client, only("zeros")).size(), 1u);
    EXPECT_EQ(match(client, only("zeros"), allVersions).size(), 1u);
}

TEST(Discovery, PrefersTheSystemVolumeAmongEqualVersions) {
    const Home home;
    addAppWith(home, "A", {.identifier = "equal"});
    addAppWith(home, "A", {.identifier = "equal"}, systemFolder);
    addAppWith(home, "B", {.identifier = "newer", .version = "2.0"});
    addAppWith(home, "B", {.identifier = "newer", .version = "1.0"}, systemFolder);
    addAppWith(home, "C", {.identifier = "plain"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    expectVersions(client, {{"equal", 0, "equal 1.0"},
                            {"newer", 0, "newer 2.0"},
                            {"newer", systemOnly, "newer 1.0"},
                            {"plain", systemOnly, ""},
                            {"equal", systemOnly, "equal 1.0"}});
    const std::vector<Item> kept = match(client, only("equal"));
    ASSERT_EQ(kept.size(), 1u);
    EXPECT_EQ(kept[0]["systemResident"], Item(true));
    EXPECT_EQ(kept[0]["path"], Item(home / "System/Applications/A.app/PlugIns/A.appex"));
}

TEST(Discovery, PrefersTheLaterRegistrationAmongEqualOnes) {
    const Home home;
    addAppWith(home, "A", {.identifier = "late-a"});
    addAppWith(home, "B", {.identifier = "late-z"});
    {
        Daemon daemon(home.path());
        ASSERT_EQ(daemon.terminate(), 0);
    }
    std::this_thread::sleep_for(1100ms); // registration dates are whole seconds
    const std::string later[] = {addAppWith(home, "Z", {.identifier = "late-a"}),
                                 addAppWith(home, "0", {.identifier = "late-z"})};
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const char* const identifiers[] = {"late-a", "late-z"};
    for (std::size_t i = 0; i < 2; ++i) {
        const std::vector<Item> kept = match(client, only(identifiers[i]));
        ASSERT_EQ(kept.size(), 1u);
        EXPECT_EQ(kept[0]["path"], Item(later[i]));
    }
}

TEST(Discovery, LeavesOutWhatTheUserExcluded) {
    const Home home;
    const std::string app = home.addApp("Some");
    for (const char* identifier : {"a", "b", "c", "d"})
        addPlugIn(app, identifier, {.identifier = identifier});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();

    struct Exclusion {
        Item value;
        const char* left;
    };

    const std::vector<Exclusion> cases = {
        {Item::array({only("a"), "junk", Item::map({{"HXExtensionIdentifier", ">c"}})}), "b c"},
        {Item::array({}), "a b c d"},
        {Item::array({Item::map({})}), ""},
        {only("a"), "a b c d"},
        {Item::array({Item::map({{"HXExtensionIdentifier", "b"}, {"Absent", true}})}), "a b c d"},
        {Item::array({Item::map({{"HXExtensionIdentifier", "b"}, {"Absent", false}})}), "a c d"}};
    EXPECT_EQ(matched(client, Item::map({})), "a b c d");
    for (const Exclusion& each : cases) {
        std::ostringstream what;
        what << each.value;
        SCOPED_TRACE(what.str());
        writeFile(home / "etc/Preferences/com.tovana.zephrin.userprefs.plist",
                  xmlPlist(Item::map({{"exclusions", each.value}})));
        EXPECT_EQ(matched(client, Item::map({})), each.left);
    }
    EXPECT_TRUE(daemon.logs(" globally excluded"));
}

TEST(Discovery, LeavesOutWhatThisClientMayNotUse) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto extension = [](const char* key, const Item& value) {
        return Item::map({{key, value}});
    };
    addPlugIn(app, "a", {.identifier = "a"});
    addPlugIn(app, "b", {.identifier = "b", .extension = extension("Dedicated", true)});
    addPlugIn(app, "c", {.identifier = "c", .extension = extension("Dedicated", 1)});
    addPlugIn(app, "d", {.identifier = "d", .extension = extension("Dedicated", "true")});
    addPlugIn(app, "e",
              {.identifier = "e", .extension = extension("HXExtensionHostEntitlement", "com.x")});
    addPlugIn(app, "f",
              {.identifier = "f", .extension = extension("HXExtensionHostEntitlement", 5)});
    const std::string placeholder = home.addApp("Coming");
    addPlugIn(placeholder, "g", {.identifier = "g"});
    writeFile(placeholder + "/.installing", "");
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "a d");
    EXPECT_TRUE(daemon.logs(": the host does not have the \"com.x\" entitlement"));
    EXPECT_TRUE(daemon.logs("because its app is a placeholder"));
}

TEST(Discovery, TellsInTheLogWhatItCounts) {
    const Home home;
    addAppWith(home, "A", {.identifier = "a"});
    addAppWith(home, "B", {.identifier = "a", .version = "2.0"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::vector<Item> forms = match(client, Item::map({}));
    ASSERT_EQ(forms.size(), 1u);
    EXPECT_TRUE(daemon.logs("ops info: Candidate plugin count: 2, info: "));
    EXPECT_TRUE(daemon.logs("ops info: Resulting plugin count: 1, UUIDs: "));
    EXPECT_TRUE(daemon.logs("a(2.0) " + forms[0]["uuid"].text()));
    EXPECT_TRUE(daemon.logs("ops debug: reply marshalled"));
    EXPECT_TRUE(match(client, Item::map({{"HXExtensionPointIdentifier", "none"}})).empty());
    EXPECT_TRUE(daemon.logs("ops info: Candidate plugin count: 0"));
    EXPECT_TRUE(daemon.logs("ops info: Resulting plugin count: 0"));
}

} // namespace
} // namespace e2e
