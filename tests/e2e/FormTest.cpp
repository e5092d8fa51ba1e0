#include <algorithm>
#include <ctime>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

std::vector<std::string> sorted(std::vector<std::string> keys) {
    std::sort(keys.begin(), keys.end());
    return keys;
}

// What every form of a plug-in within an application has.
const std::vector<std::string> commonKeys = {"annotations",
                                             "bundleInfo",
                                             "containingPath",
                                             "extensions",
                                             "hubProtocolVersion",
                                             "identifier",
                                             "info",
                                             "lastmodified",
                                             "original-identifier",
                                             "path",
                                             "service-extension",
                                             "systemResident",
                                             "uuid",
                                             "version"};

std::vector<std::string> commonKeysAnd(const std::vector<std::string>& more) {
    std::vector<std::string> keys = commonKeys;
    keys.insert(keys.end(), more.begin(), more.end());
    return sorted(keys);
}

bool isUpperCaseUuid(const std::string& text) {
    if (text.size() != 36)
        return false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const bool dash = i == 8 || i == 13 || i == 18 || i == 23;
        if (dash ? text[i] != '-' : !std::string_view("0123456789ABCDEF").contains(text[i]))
            return false;
    }
    return true;
}

TEST(Form, OfAPlainPlugInHasExactlyTheCommonKeys) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {.version = "2.5"});
    const std::time_t before = std::time(nullptr);
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const Item form = findAt(client, path);

    EXPECT_EQ(sorted(form.keys()), sorted(commonKeys));
    EXPECT_EQ(form["path"], Item(path));
    EXPECT_EQ(form["containingPath"], Item(home / "Applications/Some.app"));
    EXPECT_EQ(form["identifier"], Item("com.example.plugin"));
    EXPECT_EQ(form["original-identifier"], Item("com.example.plugin"));
    EXPECT_EQ(form["version"], Item("2.5"));
    EXPECT_EQ(form["hubProtocolVersion"], Item(2));
    EXPECT_EQ(form["systemResident"], Item(false));
    EXPECT_EQ(form["annotations"], Item::map({}));
    EXPECT_PRED1(isUpperCaseUuid, form["uuid"].text());
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
}

TEST(Form, IsTheSameByMatchAndByFind) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::vector<Item> forms = match(client, Item());
    ASSERT_EQ(forms.size(), 1u);
    EXPECT_EQ(forms[0], findAt(client, path));
}

struct FormCase {
    const char* what;
    PlugIn plugIn;
    const char* key;
    Item value; // null: the key is absent
};

TEST(Form, TellsWhatTheInfoDictionarySays) {
    const Item noVersion =
        Item::map({{"HXExtensionAttributes", Item::map({{"HXExtensionVersion", 7}})}});
    const std::vector<FormCase> cases = {
        {"its own identifier",
         {.extension = Item::map({{"HXExtensionIdentifier", "com.own"}})},
         "identifier",
         "com.own"},
        {"its own identifier at the top",
         {.info = Item::map({{"HXExtensionIdentifier", "com.own"}})},
         "identifier",
         "com.own"},
        {"a version that is no text", {.extension = noVersion}, "version", "<none>"},
        {"hub version",
         {.extension = Item::map({{"HubProtocolVersion", 5}})},
         "hubProtocolVersion",
         5},
        {"hub version of the older style",
         {.info = Item::map({{"Zephrin", Item::map({})}})},
         "hubProtocolVersion",
         1},
        {"the newer style has the say",
         {.extension = Item::map({{"HubProtocolVersion", 5}}),
          .info = Item::map({{"Zephrin", Item::map({})}})},
         "hubProtocolVersion",
         5},
        {"a data plug-in has no service",
         {.extension = Item::map({{"HXExtensionProtocol", "#Data"}})},
         "service-extension",
         Item()},
        {"no names", {}, "localizedDisplayName", Item()},
        {"long name",
         {.info = Item::map({{"BQBundleDisplayName", "Long"}})},
         "localizedDisplayName",
         "Long"},
        {"short name",
         {.info = Item::map({{"BQBundleName", "Short"}})},
         "localizedShortName",
         "Short"},
        {"never the code's hash", {}, "hash", Item()},
        {"never entitlements without a signature", {}, "entitlements", Item()}};
    const Home home;
    std::vector<std::string> paths;
    for (std::size_t i = 0; i < cases.size(); ++i) {
        PlugIn plugIn = cases[i].plugIn;
        plugIn.identifier += std::to_string(i);
        paths.push_back(addAppWith(home, "App" + std::to_string(i), plugIn));
    }
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    for (std::size_t i = 0; i < cases.size(); ++i) {
        SCOPED_TRACE(cases[i].what);
        EXPECT_EQ(findAt(client, paths[i])[cases[i].key], cases[i].value);
    }
}

TEST(Form, CarriesEveryKindOfValueFromBothFormats) {
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
    const std::string app = home.addApp("Some");
    const auto plugIn = [&](const char* identifier) {
        return PlugIn{.identifier = identifier, .info = Item::map({{"Things", things}})};
    };
    const std::string paths[] = {
        addPlugIn(app, "Text", plugIn("com.example.text")),
        addPlugIn(app, "Binary", plugIn("com.example.binary"), Format::binary)};
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    for (const std::string& path : paths) {
        SCOPED_TRACE(path);
        EXPECT_EQ(findAt(client, path)["bundleInfo"]["Things"], things);
    }
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
    EXPECT_EQ(sorted(form.keys()), commonKeysAnd({"localizedDisplayName", "localizedShortName",
                                                  "localizedContainingDisplayName"}));
    EXPECT_EQ(form["localizedDisplayName"], Item("Herd"));
    EXPECT_EQ(form["localizedShortName"], Item("O"));
    EXPECT_EQ(form["localizedContainingDisplayName"], Item("Küche"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName"], Item("Herd"));
    EXPECT_EQ(form["bundleInfo"]["BQBundleDisplayName[de]"], Item("Ofen"));
}

// Each is refused by the daemon's own check of a record; the others in its place are served.
TEST(Form, MisconfiguredPlugInsAreNotOffered) {
    const Home home;

    struct Case {
        const char* identifier;
        Item extension;
        const char* reason;
    };

    const std::vector<Case> cases = {
        {"com.example.principal", Item::map({{"PrincipalClass", "Mine"}}),
         "Application Extensions may not use the \"PrincipalClass\" key"},
        {"com.example.proxy", Item::map({{"PassProxy", false}}),
         "the \"PassProxy\" key is not supported on this platform"},
        {"com.example.hybrid", Item::map({{"EmbeddedCode", "x"}}),
         "hybrid plug-ins are not supported on this platform"},
        {"com.example.attributes", Item::map({{"HXExtensionAttributes", "none"}}),
         "missing \"HXExtensionAttributes\" key in Info.plist or SDK"}};
    const std::string app = home.addApp("Some");
    for (const Case& each : cases)
        addPlugIn(app, each.identifier,
                  {.identifier = each.identifier, .extension = each.extension});
    addPlugIn(app, "Good", {.extension = Item::map({{"PrincipalClass", "HXObject"}})});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "com.example.plugin");
    for (const Case& each : cases) {
        const std::string path = app + "/PlugIns/" + each.identifier + ".appex";
        EXPECT_TRUE(
            daemon.logs("info: ignoring mis-configured plug-in at " + path + ": " + each.reason))
            << each.reason;
        EXPECT_EQ(errorOf(client.request(findRequest(Item::map({{"paths", "file://" + path}})))),
                  "15 Cannot locate PlugIn");
    }
}

} // namespace
} // namespace e2e
