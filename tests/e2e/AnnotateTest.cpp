#include <cmath>

#include <gtest/gtest.h>

#include "tests/e2e/Annotations.h"

namespace e2e {
namespace {

const std::string unknownPlugIn = "00000000-0000-4000-8000-000000000000";
const std::string badDictionary = "4 invalid request format (bad annotations dictionary)";

Item deep(int levels) {
    Item item = Item::map({});
    for (; levels > 1; --levels)
        item = Item::map({{"d", item}});
    return item;
}

// What no property list holds, or what is past a limit, each as an extension.
std::vector<Item> unstorable() {
    const std::vector<Item> values = {Item(),
                                      Item::uuid(unknownPlugIn),
                                      Item::url("file:///a"),
                                      INFINITY,
                                      Item::date(NAN),
                                      Item::date(1e300),
                                      "\x1b",
                                      "\xef\xbf\xbe", // U+FFFE
                                      std::string(65'536, 'x')};
    std::vector<Item> result = {Item::map({{"\x01", 1}}), deep(62)};
    for (const Item& value : values)
        result.push_back(Item::map({{"k", Item::array({Item::map({{"v", value}})})}}));
    return result;
}

struct Case {
    Item keys;
    std::string error;
    const char* changed = ""; // identifiers of plug-ins
    int notifications = 0;
};

class AnnotateTest : public AnnotationTest {
protected:
    void expect(const char* type, const std::vector<Case>& cases) {
        std::map<std::string, Item> before = annotations();
        for (const Case& each : cases) {
            std::ostringstream what;
            what << each.keys;
            SCOPED_TRACE(what.str().substr(0, 300));
            const std::uint64_t posted = notifications();
            EXPECT_EQ(answer(envelope(type, each.keys)), each.error);
            EXPECT_EQ(notifications() - posted, each.notifications);
            std::string changed;
            const std::map<std::string, Item> after = annotations();
            for (const auto& [identifier, annotation] : after) {
                if (!(annotation == before[identifier]))
                    changed += (changed.empty() ? "" : " ") + identifier;
            }
            EXPECT_EQ(changed, each.changed);
            before = after;
        }
    }

    // Another change each time.
    Item change() { return Item::map({{"election", ++changes}}); }

    // Keys of an "annotate".
    static Item applying(const Item& change, std::vector<Item> plugIns) {
        return Item::map({{"annotations", change}, {"uuids", Item::array(std::move(plugIns))}});
    }

    Item changing(std::vector<Item> plugIns, const Item& more = Item::map({})) {
        return applying(change(), std::move(plugIns)).merged(more);
    }

    const Item a = uuid("a");
    const Item b = uuid("b");
    const Item d = uuid("d");
    const Item unknown = Item::uuid(unknownPlugIn);
    int changes = 0;
};

TEST_F(AnnotateTest, AppliesOneChangeToAList) {
    const std::string format = "4 invalid request format ";
    const std::string noUuid = format + "(uuid)";
    const std::string extension = format + "(annotation extension)";
    const std::string notFound = "4 no such plugin (uuid not found)";
    const Item twoPaths = Item::array({pathOf("c"), pathOf("b")});
    const auto withPaths = [&](std::vector<Item> plugIns, const Item& paths) {
        return changing(std::move(plugIns), Item::map({{"paths", paths}}));
    };
    const auto applyingToA = [&](std::initializer_list<Item::Pair> change) {
        return applying(Item::map(change), {a});
    };
    std::vector<Case> cases = {
        {Item::map({}), badDictionary},
        {Item::map({{"annotations", Item::array({})}}), badDictionary},
        {applyingToA({{"election", "1"}, {"extension", 1}}), format + "(annotation election)"},
        {applyingToA({{"election", NAN}}), format + "(annotation election)"},
        {applyingToA({{"election", 1}, {"extension", "x"}}), extension},
        {Item::map({{"annotations", Item::map({{"other", Item()}})}}), ""},
        {Item::map({{"annotations", change()}}), noUuid},
        {changing({a}, Item::map({{"uuids", a}})), noUuid},
        {changing({}), "", "", 1},
        {changing({a, b}), "", "a b", 1},
        {applying(Item::map({{"election", changes}}), {a, b}), "", "", 1},
        {changing({a, "text", b}), "4 invalid request (bad uuid array)", "a"},
        {changing({a, unknown, b}), notFound, "a"},
        {withPaths({unknown, unknown}, twoPaths), "", "b c", 1},
        {withPaths({a, unknown}, Item::array({5, 5})), notFound, "a"},
        {withPaths({unknown}, Item::array({"/no\nwhere"})), notFound},
        {withPaths({a, unknown}, Item::array({"/x"})), notFound, "a"},
        {withPaths({unknown}, pathOf("b")), notFound},
        {applyingToA({{"election", true}, {"more", 1}}), "", "a", 1},
        {applyingToA({{"extension", deep(61)}}), "", "a", 1}};
    for (const Item& bad : unstorable())
        cases.push_back(
            {applying(Item::map({{"election", 1}, {"extension", bad}}), {b}), extension});
    // Small enough by itself, but not together with the election that "b" has.
    const Item large = Item::map({{"x", std::string(65'515, 'x')}});
    cases.push_back({applying(Item::map({{"extension", large}}), {d, b}), extension, "d"});
    expect("annotate", cases);
    EXPECT_EQ(annotations().at("a"), Item::map({{"election", true}, {"extension", deep(61)}}));
    stop();
    const std::string from =
        "client " + std::to_string(getpid()) + " plug-in a(" + uuids.at("a") + ") ";
    expectLog({{"traffic default: Paths present but not an array (ignoring values)", 1},
               {"traffic default: Paths present but has different count than UUIDs (ignoring)", 1},
               {"traffic info: Failed to find plugin by " + unknownPlugIn, 4},
               {"traffic info: Looking for plugin " + unknownPlugIn + " by path /no\\nwhere", 1},
               {"ops info: " + from + "election := true", 1},
               {"ops debug: " + from + "annotation change: {\"election\"", 7}});
}

TEST_F(AnnotateTest, AppliesAnExtensionToEach) {
    const char* const value = "18 annotations values must be dictionaries";
    const std::string uuidA = uuids.at("a");
    const auto bulk = [](std::initializer_list<Item::Pair> extensions) {
        return Item::map({{"annotations", Item::map(extensions)}});
    };
    std::vector<Case> cases = {
        {Item::map({}), badDictionary},
        {Item::map({{"annotations", 1}}), badDictionary},
        {bulk({}), "", "", 1},
        {bulk({{uuidA, change()}, {uuids.at("b"), change()}}), "", "a b", 1},
        {bulk({{uuidA, change()}, {"~", 5}}), value, "a"},
        {bulk({{uuidA, change()}, {"~", change()}}), "18 invalid plug-in UUID value", "a"},
        {bulk({{unknownPlugIn, change()}}), "2 no plug-in with the requested uuid"}};
    for (const Item& bad : unstorable())
        cases.push_back({bulk({{uuidA, change()}, {"~", bad}}), value});
    expect("bulk-annotate", cases);
    EXPECT_TRUE(annotations().at("a").has("extension"));
    EXPECT_FALSE(annotations().at("a").has("election"));
    stop();
    EXPECT_EQ(daemon->linesWith("ops debug: client " + std::to_string(getpid()) +
                                " bulk plug-in a(" + uuidA + "ublic}@) annotation change: {"),
              3U);
    EXPECT_GE(daemon->linesWith("ops debug: bulk change requested for 2 plug-ins"), 3U);
}

} // namespace
} // namespace e2e
