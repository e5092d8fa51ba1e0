#include <ctime>
#include <functional>

#include <gmock/gmock.h>

#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

using Form = DaemonTest;

TEST_F(Form, OfAPlainPlugInHasExactlyTheCommonKeys) {
    const std::string path = addAppWith(home, "Some", {.version = "2.5"});
    const std::time_t before = std::time(nullptr);
    start();
    const Item form = findAt(*client, path);

    EXPECT_THAT(form.keys(), testing::UnorderedElementsAre(
                                 "annotations", "bundleInfo", "containingPath", "extensions",
                                 "hubProtocolVersion", "identifier", "info", "lastmodified",
                                 "original-identifier", "path", "service-extension",
                                 "systemResident", "uuid", "version"));
    const PlugIn same{.version = "2.5"};
    const Item bundleInfo = same.infoDictionary().merged(
        Item::map({{"HXExtensionPointIdentifier", "com.tovana.widget"}}));
    for (const auto& [key, value] : {Item::Pair{"path", path},
                                     {"containingPath", home / "Applications/Some.app"},
                                     {"identifier", "com.example.plugin"},
                                     {"original-identifier", "com.example.plugin"},
                                     {"version", "2.5"},
                                     {"hubProtocolVersion", 2},
                                     {"systemResident", false},
                                     {"annotations", Item::map({})},
                                     {"info", bundleInfo["HXExtension"]},
                                     {"bundleInfo", bundleInfo}})
        EXPECT_EQ(form[key], value) << key;
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

    EXPECT_EQ(match(*client, Item()), std::vector{form}); // the same by "match" and by "find"
}

TEST_F(Form, CarriesEveryKindOfValue) {
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
    const std::string path = addAppWith(home, "Some", {.info = Item::map({{"Things", things}})});
    start();
    EXPECT_EQ(findAt(*client, path)["bundleInfo"]["Things"], things);
}

TEST_F(Form, SpeaksTheLanguageOfTheBox) {
    const std::string file = home / "etc/locale.conf";
    writeFile(file, "LANG=de_AT.UTF-8\n");
    const std::string app = home.addApp(
        "Some", "Applications",
        Item::map({{"BQBundleDisplayName", "Kitchen"}, {"BQBundleDisplayName[de]", "Küche"}}));
    const std::string path = addPlugIn(app, "Some",
                                       {.info = Item::map({{"BQBundleDisplayName", "Oven"},
                                                           {"BQBundleDisplayName[de]", "Ofen"},
                                                           {"BQBundleDisplayName[de_AT]", "Herd"},
                                                           {"BQBundleName", "O"},
                                                           {"BQBundleName[fr]", "F"}})});
    start();
    const Item form = findAt(*client, path);
    EXPECT_EQ(form["localizedDisplayName"], Item("Herd"));
    EXPECT_EQ(form["localizedShortName"], Item("O"));
    EXPECT_EQ(form["localizedContainingDisplayName"], Item("Küche"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName"], Item("Herd"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName[de]"], Item("Ofen"));

    const auto write = [](const std::string& to, const char* locale) {
        writeFile(to, std::string("LANG=") + locale + "\n");
    };

    const std::tuple<const char*, std::function<void()>, const char*> changes[] = {
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

    for (const auto& [what, act, name] : changes) {
        act();
        EXPECT_TRUE(eventually([&, now = Item(name)] {
            return findAt(*client, path)["localizedDisplayName"] == now &&
                   match(*client).at(0)["localizedDisplayName"] == now;
        })) << what;
    }
    for (const char* line : {"ops default: locale change detected; purging cache",
                             "ops info: purging cache for 1 > 0"})
        EXPECT_TRUE(eventually([&] { return daemon->linesWith(line) >= std::size(changes); }));
}

TEST_F(Form, MisconfiguredPlugInsAreNotOffered) {
    const std::string app = home.addApp("Some");
    const std::string bad = addPlugIn(
        app, "Bad", {.identifier = "bad", .extension = Item::map({{"PrincipalClass", "Mine"}})});
    addPlugIn(app, "Good", {.extension = Item::map({{"PrincipalClass", "HXObject"}})});
    start();
    EXPECT_EQ(seen(), "com.example.plugin");
    EXPECT_EQ(answer(findRequest(Item::map({{"paths", "file://" + bad}}))),
              "15 Cannot locate PlugIn");
    EXPECT_TRUE(daemon->logs("info: ignoring mis-configured plug-in at " + bad +
                             ": Application Extensions may not use the \"PrincipalClass\" key"));
}

} // namespace
} // namespace e2e
