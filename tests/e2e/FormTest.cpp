#include <algorithm>
#include <ctime>
#include <filesystem>
#include <functional>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

std::string keysOf(const Item& form) {
    std::vector<std::string> keys = form.keys();
    std::sort(keys.begin(), keys.end());
    std::string text;
    for (const std::string& key : keys)
        text += key + " ";
    return text;
}

TEST(Form, OfAPlainPlugInHasExactlyTheCommonKeys) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {.version = "2.5"});
    const std::time_t before = std::time(nullptr);
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const Item form = findAt(client, path);

    EXPECT_EQ(keysOf(form), "annotations bundleInfo containingPath extensions hubProtocolVersion "
                            "identifier info lastmodified original-identifier path "
                            "service-extension systemResident uuid version ");
    EXPECT_EQ(form["path"], Item(path));
    EXPECT_EQ(form["containingPath"], Item(home / "Applications/Some.app"));
    EXPECT_EQ(form["identifier"], Item("com.example.plugin"));
    EXPECT_EQ(form["original-identifier"], Item("com.example.plugin"));
    EXPECT_EQ(form["version"], Item("2.5"));
    EXPECT_EQ(form["hubProtocolVersion"], Item(2));
    EXPECT_EQ(form["systemResident"], Item(false));
    EXPECT_EQ(form["annotations"], Item::map({}));
    EXPECT_THAT(form["uuid"].text(),
                testing::MatchesRegex("[0-9A-F]{8}(-[0-9A-F]{4}){3}-[0-9A-F]{12}"));
    EXPECT_EQ(form["lastmodified"].kind(), Item::Kind::number);
    EXPECT_GE(form["lastmodified"].integer(), before - 1);
    EXPECT_LE(form["lastmodified"].integer(), std::time(nullptr) + 1);
    EXPECT_EQ(form["extensions"].keys(), std::vector<std::string>{"."});
    EXPECT_EQ(form["extensions"]["."].kind(), Item::Kind::text);
    EXPECT_NE(form["extensions"]["."].text(), "");
    EXPECT_EQ(form["service-extension"].kind(), Item::Kind::text);
    EXPECT_NE(form["service-extension"].text(), form["extensions"]["."].text());

    const PlugIn same{.version = "2.5"};
    EXPECT_EQ(form["info"], same.infoDictionary()["HXExtension"]);
    Item expected = same.infoDictionary();
    expected.set("HXExtensionPointIdentifier", "com.tovana.widget");
    EXPECT_EQ(form["bundleInfo"], expected);
    EXPECT_EQ(match(client, Item()), std::vector{form}); // the same by "match" and by "find"
}

TEST(Form, CarriesEveryKindOfValue) {
    const Item things = Item::map({{"text", "<&> äöü 日本 😀"},
                                   {"empty", ""},
                                   {"true", true},
                                   {"false", false},
                                   {"small", 23},
                                   {"large", Item(std::int64_t{1} << 40)},
                                   {"below zero", -5},
                                   {"real", 2.5},
                                   {"data", Item::bytes(std::string("\0\xff\x7f bytes", 9))},
                                   {"date", Item::date(1000000000)},
                                   {"list", Item::array({1, "two", Item::array({})})},
                                   {"nested", Item::map({{"a", Item::map({{"b", "c"}})}})}});
    const Home home;
    const std::string path = addAppWith(home, "Some", {.info = Item::map({{"Things", things}})});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(findAt(client, path)["bundleInfo"]["Things"], things);
}

TEST(Form, SpeaksTheLanguageOfTheBox) {
    const Home home;
    writeFile(home / "etc/locale.conf", "LANG=de_AT.UTF-8\n");
    const std::string app = home.addApp(
        "Some", "Applications",
        Item::map({{"BQBundleDisplayName", "Kitchen"}, {"BQBundleDisplayName[de]", "Küche"}}));
    const std::string path = addPlugIn(app, "Some",
                                       {.info = Item::map({{"BQBundleDisplayName", "Oven"},
                                                           {"BQBundleDisplayName[de]", "Ofen"},
                                                           {"BQBundleDisplayName[de_AT]", "Herd"},
                                                           {"BQBundleName", "O"},
                                                           {"BQBundleName[fr]", "F"}})});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const Item form = findAt(client, path);
    EXPECT_EQ(form["localizedDisplayName"], Item("Herd"));
    EXPECT_EQ(form["localizedShortName"], Item("O"));
    EXPECT_EQ(form["localizedContainingDisplayName"], Item("Küche"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName"], Item("Herd"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName[de]"], Item("Ofen"));

    const std::string file = home / "etc/locale.conf";
    const auto write = [](const std::string& to, const char* locale) {
        writeFile(to, std::string("LANG=") + locale + "\n");
    };

    struct {
        const char* what;
        std::function<void()> act;
        const char* name;
    } const changes[] = {
        {"written", [&] { write(file, "de"); }, "Ofen"},
        {"removed", [&] { fs::remove(file); }, "Oven"},
        {"made", [&] { write(file, "de_AT"); }, "Herd"},
        {"replaced",
         [&] {
             write(home / "etc/new", "de_DE");
             fs::rename(home / "etc/new", file);
         },
         "Ofen"},
        {"removed with its folder", [&] { fs::remove_all(home / "etc"); }, "Oven"},
        {"made with its folder", [&] { write(file, "de_AT"); }, "Herd"},
    };

    for (const auto& change : changes) {
        SCOPED_TRACE(change.what);
        change.act();
        EXPECT_TRUE(eventually([&] {
            return findAt(client, path)["localizedDisplayName"] == Item(change.name) &&
                   match(client, Item()).front()["localizedDisplayName"] == Item(change.name);
        }));
    }
    for (const char* line : {"ops default: locale change detected; purging cache",
                             "ops info: purging cache for 1 > 0"})
        EXPECT_TRUE(eventually([&] { return daemon.linesWith(line) >= std::size(changes); }));
}

TEST(Form, MisconfiguredPlugInsAreNotOffered) {
    const Home home;
    const std::string app = home.addApp("Some");
    const std::string bad = addPlugIn(
        app, "Bad", {.identifier = "bad", .extension = Item::map({{"PrincipalClass", "Mine"}})});
    addPlugIn(app, "Good", {.extension = Item::map({{"PrincipalClass", "HXObject"}})});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "com.example.plugin");
    EXPECT_EQ(errorOf(client.request(findRequest(Item::map({{"paths", "file://" + bad}})))),
              "15 Cannot locate PlugIn");
    EXPECT_TRUE(daemon.logs("info: ignoring mis-configured plug-in at " + bad +
                            ": Application Extensions may not use the \"PrincipalClass\" key"));
}

} // namespace
} // namespace e2e
