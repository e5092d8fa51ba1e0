#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

struct Case {
    const char* key;
    Item pattern;
    const char* matches; // identifiers, sorted
};

void expectMatches(WireClient& client, const std::vector<Case>& cases) {
    for (const Case& each : cases) {
        std::ostringstream what;
        what << each.key << " = " << each.pattern;
        SCOPED_TRACE(what.str());
        EXPECT_EQ(matched(client, Item::map({{each.key, each.pattern}})), each.matches);
    }
}

Item list(std::vector<Item> items) {
    return Item::array(std::move(items));
}

TEST(Rules, StringOperatorsCompareNumerically) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const char* level) {
        addPlugIn(app, identifier,
                  {.identifier = identifier, .attributes = Item::map({{"Level", level}})});
    };
    add("a", "2.9");
    add("b", "2.10");
    add("c", "2.10.1");
    add("d", "2.010");
    add("e", "");
    add("f", "<x");
    add("g", "99999999999999999999999");
    addPlugIn(app, "h", {.identifier = "h"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    expectMatches(client, {{"Level", "2.10", "b d"},
                           {"Level", "=2.10", "b d"},
                           {"Level", "<>2.10", "a c e f g"},
                           {"Level", ">=2.10", "b c d f g"},
                           {"Level", ">2.10", "c f g"},
                           {"Level", "<=2.10", "a b d e"},
                           {"Level", "<2.10", "a e"},
                           {"Level", "=<x", "f"},
                           {"Level", "<>", "a b c d f g"},
                           {"Level", "=", "e"},
                           {"Level", "", "e"},
                           {"Level", ">99999999999999999999998", "f g"},
                           {"Level", ">99999999999999999999999", "f"},
                           {"Level", "*", ""},
                           {"Level", "?KM-OTHER:2.9", ""},
                           {"Level", "?", ""}});
    EXPECT_TRUE(daemon.logs("info: unrecognized match operator:?KM-OTHER:2.9"));
}

TEST(Rules, PatternsAndValuesOfEveryKind) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const Item& value) {
        addPlugIn(app, identifier,
                  {.identifier = identifier, .attributes = Item::map({{"Value", value}})});
    };
    add("array", list({"a", "b"}));
    add("dictionary", Item::map({{"public.image", 2}}));
    add("false", false);
    add("mixed", list({3, "b", Item::map({})}));
    add("nothing", list({}));
    add("number", 3);
    add("text", "b");
    add("true", true);
    add("zero", 0);
    addPlugIn(app, "absent", {.identifier = "absent"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::string thereAndNotFalse = "array dictionary mixed nothing number text true";
    const std::string notThereOrFalse = "absent false zero";
    expectMatches(client, {{"Value", true, thereAndNotFalse.c_str()},
                           {"Value", 1, thereAndNotFalse.c_str()},
                           {"Value", 1.0, thereAndNotFalse.c_str()},
                           {"Value", false, notThereOrFalse.c_str()},
                           {"Value", 0, notThereOrFalse.c_str()},
                           {"Value", 2, ""},
                           {"Value", 3, ""},
                           {"Value", "3", ""},
                           {"Value", Item(), ""},
                           {"Value", "b", "array mixed text"},
                           {"Value", list({"c", "a"}), "array"},
                           {"Value", list({"c", "b"}), "array mixed text"},
                           {"Value", list({3, true, "text"}), ""},
                           {"Value", list({}), ""},
                           {"Value", list({list({"b"})}), ""},
                           {"Value", "<>b", "array"},
                           {"Value", Item::bytes("b"), ""}});
}

TEST(Rules, KeysNamePropertiesOfThePlugIn) {
    const Home home;
    const std::string app = home.addApp("Some");
    addPlugIn(app, "a",
              {.identifier = "a", .point = "point.one", .info = Item::map({{"Top", "t"}})});
    addPlugIn(app, "b",
              {.identifier = "b",
               .point = "point.two",
               .attributes = Item::map({{"Top", "attribute"}, {"HXExtensionIdentifier", "x"}}),
               .info = Item::map({{"Top", "t"}})});
    const std::string other = home.addApp("Other");
    const std::string path = addPlugIn(other, "c", {.identifier = "c", .point = "point.one"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::string uuid = findAt(client, path)["uuid"].text();
    expectMatches(client,
                  {{"HXExtensionPointIdentifier", "point.one", "a c"},
                   {"HXExtensionPointIdentifier", "=point.two", "b"},
                   {"HXExtensionPointIdentifier", "<>point.two", "a c"},
                   {"HXExtensionPointIdentifier", list({"point.two", "point.one"}), "a b c"},
                   {"HXExtensionPointIdentifier", "point.none", ""},
                   {"HXExtensionPointIdentifier", true, "a b c"},
                   {"HXExtensionPointIdentifier", false, ""},
                   {"HXExtensionIdentifier", ">=b", "b c"},
                   {"com.tovana.uuid", uuid, "c"},
                   {"com.tovana.uuid", list({"x", uuid}), "c"},
                   {"HXExtensionContainingApp", app, "a b"},
                   {"HXExtensionContainingApp", "<>" + app, "c"},
                   {"HXExtensionContainingApp", false, ""},
                   {"Top", "t", "a"},
                   {"Top", "attribute", "b"},
                   {"Top", false, "c"},
                   {"BQBundleExecutable", "plugin", "a b c"},
                   {"ENTITLEMENT:any", false, "a b c"},
                   {"ENTITLEMENT:any", true, ""},
                   {"ENTITLEMENT:", "x", ""},
                   {"HXUserElection", "0", "a b c"},
                   {"HXUserElection", "1", ""},
                   {"", false, "a b c"}});
    EXPECT_EQ(
        matched(client, Item::map({{"HXExtensionPointIdentifier", "point.one"}, {"Top", "t"}})),
        "a");
    EXPECT_EQ(matched(client, Item()), "a b c");
    EXPECT_EQ(matched(client, Item::map({})), "a b c");
}

TEST(Rules, TypesAndActivationRules) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const Item& value) {
        addPlugIn(app, identifier,
                  {.identifier = identifier, .attributes = Item::map({{"Rule", value}})});
    };
    add("always", true);
    add("never", false);
    add("same", "com.example.photo");
    add("two", Item::map({{"com.example.photo", 2}}));
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    expectMatches(client, {{"Rule", "?KM-CONFORMS:com.example.photo", "same"},
                           {"Rule", "?KM-IS:com.example.photo", "same"},
                           {"Rule", "?KM-CONFORMS:com.example.film", ""},
                           {"Rule", Item::map({{"com.example.photo", 2}}), "always two"},
                           {"Rule", Item::map({{"com.example.photo", 3}}), "always"},
                           {"Rule", Item::map({{"com.example.film", 1}}), "always"},
                           {"Rule", Item::map({}), ""}});
    EXPECT_TRUE(daemon.logs("debug: evaluating HXExtension filter: "));
}

} // namespace
} // namespace e2e
