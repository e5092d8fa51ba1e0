#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

// One pass over what rules may say; each operator and kind of value has its own tests elsewhere.
TEST(Rules, OfEveryKindNarrowAMatch) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const char* identifier, const Item& value) {
        return addPlugIn(app, identifier,
                         {.identifier = identifier, .attributes = Item::map({{"Value", value}})});
    };
    add("array", Item::array({"2.9", 3}));
    add("false", false);
    add("nine", "2.9");
    add("offer", Item::map({{"com.example.photo", 2}}));
    add("ten", "2.10");
    add("type", "com.example.photo");
    const std::string other = home.addApp("Other");
    const std::string path = addPlugIn(other, "x", {.identifier = "x", .point = "point.x"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::string uuid = findAt(client, path)["uuid"].text();

    struct Case {
        const char* key;
        Item pattern;
        const char* matches; // identifiers, sorted
    };

    const std::vector<Case> cases = {
        {"Value", "2.9", "array nine"},
        {"Value", "=2.10", "ten"},
        {"Value", "<>2.9", "ten type"},
        {"Value", ">=2.10", "ten type"},
        {"Value", "<2.10", "array nine"},
        {"Value", Item::array({"2.10", "2.9"}), "array nine ten"},
        {"Value", Item::array({}), ""},
        {"Value", true, "array nine offer ten type"},
        {"Value", 0, "false x"},
        {"Value", 3, ""},
        {"Value", Item(), ""},
        {"Value", "?KM-CONFORMS:com.example.photo", "type"},
        {"Value", "?KM-OTHER:2.9", ""},
        {"Value", Item::map({{"com.example.photo", 2}}), "offer"},
        {"Value", Item::map({{"com.example.photo", 3}}), ""},
        {"HXExtensionPointIdentifier", "point.x", "x"},
        {"HXExtensionPointIdentifier", Item::array({"point.none"}), ""},
        {"HXExtensionPointIdentifier", false, ""},
        {"com.tovana.uuid", uuid, "x"},
        {"HXExtensionContainingApp", other, "x"},
        {"BQBundleExecutable", "plugin", "array false nine offer ten type x"},
        {"ENTITLEMENT:any", true, ""}};
    for (const Case& each : cases) {
        std::ostringstream what;
        what << each.key << " = " << each.pattern;
        SCOPED_TRACE(what.str());
        EXPECT_EQ(matched(client, Item::map({{each.key, each.pattern}})), each.matches);
    }
    const Item both = Item::map({{"Value", "2.9"}, {"HXExtensionIdentifier", "nine"}});
    EXPECT_EQ(matched(client, both), "nine");
    EXPECT_EQ(matched(client, Item()), "array false nine offer ten type x");
    EXPECT_TRUE(daemon.logs("info: unrecognized match operator:?KM-OTHER:2.9"));
    EXPECT_TRUE(daemon.logs("debug: evaluating HXExtension filter: "));
}

} // namespace
} // namespace e2e
