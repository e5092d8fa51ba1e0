#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

using Rules = DaemonTest;

// One pass over what rules may say; each operator and kind of value has its own tests elsewhere.
TEST_F(Rules, OfEveryKindNarrowAMatch) {
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
    start();
    const std::string uuid = findAt(*client, path)["uuid"].text();

    // A rule, and the identifiers that it leaves, sorted.
    const std::tuple<const char*, Item, const char*> cases[] = {
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
    for (const auto& [key, pattern, matches] : cases)
        EXPECT_EQ(seen(Item::map({{key, pattern}})), matches) << key << " = " << pattern;
    const Item both = Item::map({{"Value", "2.9"}, {"HXExtensionIdentifier", "nine"}});
    EXPECT_EQ(seen(both), "nine");
    EXPECT_EQ(seen(Item()), "array false nine offer ten type x");
    EXPECT_TRUE(daemon->logs("info: unrecognized match operator:?KM-OTHER:2.9"));
    EXPECT_TRUE(daemon->logs("debug: evaluating HXExtension filter: "));
}

} // namespace
} // namespace e2e
