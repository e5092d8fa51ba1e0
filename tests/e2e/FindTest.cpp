#include <filesystem>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

const char* const notFound = "15 Cannot locate PlugIn";

std::string percentEncoded(const std::string& path) {
    std::string out;
    for (const char c : path)
        out += c == '.' ? "%2E" : c == 'p' ? "%70" : std::string(1, c);
    return out;
}

TEST(Find, TakesAUuidOrAFileUrl) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {});
    const std::string other = addAppWith(home, "Other", {.identifier = "com.example.other"});
    std::filesystem::create_symlink(path, home / "link.appex");
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const Item uuid = Item::uuid(findAt(client, path)["uuid"].text());
    const Item otherUuid = Item::uuid(findAt(client, other)["uuid"].text());
    const Item url = "file://" + path;
    const Item nowhere = "file://" + home / "Applications/None.app";

    struct Case {
        const char* what;
        Item arguments;
        bool found;
    };

    const auto byPath = [](const std::string& text) { return Item::map({{"paths", text}}); };
    const std::vector<Case> cases = {
        {"by UUID", Item::map({{"uuids", uuid}}), true},
        {"by URL", Item::map({{"paths", url}}), true},
        {"the path has the last word", Item::map({{"uuids", otherUuid}, {"paths", url}}), true},
        {"also when it finds nothing", Item::map({{"uuids", uuid}, {"paths", nowhere}}), false},
        {"paths as array is ignored", Item::map({{"uuids", uuid}, {"paths", Item::array({url})}}),
         true},
        {"paths as a URL value is ignored",
         Item::map({{"uuids", uuid}, {"paths", Item::url(nowhere.text())}}), true},
        {"neither", Item::map({}), false},
        {"UUID as text", Item::map({{"uuids", findAt(client, path)["uuid"]}}), false},
        {"UUID in an array", Item::map({{"uuids", Item::array({uuid})}}), false},
        {"unknown UUID", Item::map({{"uuids", Item::uuid("00000000-0000-0000-0000-000000000001")}}),
         false},
        {"localhost", byPath("file://localhost" + path), true},
        {"another host", byPath("file://elsewhere" + path), false},
        {"trailing slash", byPath("file://" + path + "/"), true},
        {"dots in the path", byPath("file://" + path + "/../../PlugIns/./Some.appex"), true},
        {"percent-encoded", byPath("file://" + percentEncoded(path)), true},
        {"through a link", byPath("file://" + home / "link.appex"), true},
        {"no scheme", byPath(path), false},
        {"another scheme", byPath("http://" + path), false},
        {"an application", byPath("file://" + home / "Applications/Some.app"), false},
        {"NUL at the end", byPath("file://" + path + std::string(1, '\0')), false},
        {"encoded NUL at the end", byPath("file://" + path + "%00"), false},
        {"broken encoding", byPath("file://" + path + "%"), false},
        {"nothing but a scheme", byPath("file://"), false},
        {"empty", byPath(""), false}};
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        const Item reply = client.request(findRequest(each.arguments));
        EXPECT_EQ(errorOf(reply), each.found ? "" : notFound);
        if (each.found) {
            EXPECT_EQ(formOf(reply)["path"], Item(path));
        }
    }
}

TEST(Find, TellsInTheLogWhatItFound) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {});
    const Daemon daemon(home.path(), {.logLevel = "default"});
    WireClient client = daemon.connect();
    const std::string uuid = findAt(client, path)["uuid"].text();
    EXPECT_TRUE(daemon.logs("ops default: plugin found "));
    EXPECT_EQ(errorOf(client.request(findRequest(Item::map({})))), notFound);
    EXPECT_TRUE(daemon.logs("ops default: plugin not found"));
}

// A plug-in that discovery would not offer to this client is still found.
TEST(Find, PassesOverWhatDiscoveryFilters) {
    const Home home;
    const std::string path = addAppWith(
        home, "Some",
        {.extension = Item::map({{"Dedicated", true}, {"HXExtensionHostEntitlement", "com.x"}})});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "");
    EXPECT_EQ(findAt(client, path)["identifier"], Item("com.example.plugin"));
}

TEST(Find, KeepsUuidsOverARestartAndGivesNewOnesToChangedBundles) {
    const Home home;
    const std::string same = addAppWith(home, "Same", {});
    const std::string touched = addAppWith(home, "Touched", {.identifier = "com.example.touched"});
    const std::string changed = addAppWith(home, "Changed", {.identifier = "com.example.changed"});
    std::vector<Item> before;
    std::vector<Item> after;
    for (std::vector<Item>* uuids : {&before, &after}) {
        Daemon daemon(home.path());
        WireClient client = daemon.connect();
        for (const std::string& path : {same, touched, changed})
            uuids->push_back(findAt(client, path)["uuid"]);
        ASSERT_EQ(daemon.terminate(), 0);
        writeFile(touched + "/Info.plist", readFile(touched + "/Info.plist"));
        writeFile(changed + "/plugin", "#!/bin/sh\n# another\n", 0755);
    }
    EXPECT_EQ(before[0], after[0]);
    EXPECT_EQ(before[1], after[1]);
    EXPECT_NE(before[2], after[2]);
}

} // namespace
} // namespace e2e
