#include <cmath>

#include <gtest/gtest.h>

#include "tests/e2e/Annotations.h"

namespace e2e {
namespace {

constexpr const char* unknownPlugIn = "00000000-0000-4000-8000-000000000000";

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
    const char* type;
    Item keys;
    const char* error;
    const char* changed; // identifiers of plug-ins
    int notifications;
};

class AnnotateTest : public testing::Test {
protected:
    void expect(const std::vector<Case>& cases) {
        std::map<std::string, Item> before = world.annotations();
        for (const Case& each : cases) {
            std::ostringstream what;
            what << each.type << " " << each.keys;
            SCOPED_TRACE(what.str().substr(0, 300));
            const std::uint64_t posted = world.notifications();
            EXPECT_EQ(errorOf(world.client->request(envelope(each.type, each.keys))), each.error);
            EXPECT_EQ(world.notifications() - posted, each.notifications);
            std::string changed;
            const std::map<std::string, Item> after = world.annotations();
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
    Item applying(const Item& change, std::vector<Item> uuids) {
        return Item::map({{"annotations", change}, {"uuids", Item::array(std::move(uuids))}});
    }

    Item changing(std::vector<Item> uuids, const Item& more = Item::map({})) {
        return applying(change(), std::move(uuids)).merged(more);
    }

    AnnotatedHome world{{"a", "b", "c", "d"}};
    const Item a = Item::uuid(world.uuids.at("a"));
    const Item b = Item::uuid(world.uuids.at("b"));
    const Item d = Item::uuid(world.uuids.at("d"));
    const Item unknown = Item::uuid(unknownPlugIn);
    int changes = 0;
};

TEST_F(AnnotateTest, AppliesOneChangeToAList) {
    const char* const dictionary = "4 invalid request format (bad annotations dictionary)";
    const char* const election = "4 invalid request format (annotation election)";
    const char* const extension = "4 invalid request format (annotation extension)";
    const char* const notFound = "4 no such plugin (uuid not found)";
    const Item paths = Item::array({world.pathOf("c"), world.pathOf("b")});
    std::vector<Case> cases = {
        {"annotate", Item::map({}), dictionary, "", 0},
        {"annotate", Item::map({{"annotations", Item::array({})}}), dictionary, "", 0},
        {"annotate", applying(Item::map({{"election", "1"}, {"extension", 1}}), {a}), election, "",
         0},
        {"annotate", applying(Item::map({{"election", NAN}}), {a}), election, "", 0},
        {"annotate", applying(Item::map({{"election", 1}, {"extension", "x"}}), {a}), extension, "",
         0},
        {"annotate", Item::map({{"annotations", Item::map({{"other", Item()}})}}), "", "", 0},
        {"annotate", Item::map({{"annotations", change()}}), "4 invalid request format (uuid)", "",
         0},
        {"annotate", changing({a}, Item::map({{"uuids", a}})), "4 invalid request format (uuid)",
         "", 0},
        {"annotate", changing({}), "", "", 1},
        {"annotate", changing({a, b}), "", "a b", 1},
        {"annotate", applying(Item::map({{"election", changes}}), {a, b}), "", "", 1},
        {"annotate", changing({a, "text", b}), "4 invalid request (bad uuid array)", "a", 0},
        {"annotate", changing({a, unknown, b}), notFound, "a", 0},
        {"annotate", changing({unknown, unknown}, Item::map({{"paths", paths}})), "", "b c", 1},
        {"annotate", changing({a, unknown}, Item::map({{"paths", Item::array({5, 5})}})), notFound,
         "a", 0},
        {"annotate", changing({unknown}, Item::map({{"paths", Item::array({"/no\nwhere"})}})),
         notFound, "", 0},
        {"annotate", changing({a, unknown}, Item::map({{"paths", Item::array({"/x"})}})), notFound,
         "a", 0},
        {"annotate", changing({unknown}, Item::map({{"paths", world.pathOf("b")}})), notFound, "",
         0},
        {"annotate", applying(Item::map({{"election", true}, {"more", 1}}), {a}), "", "a", 1},
        {"annotate", applying(Item::map({{"extension", deep(61)}}), {a}), "", "a", 1}};
    for (const Item& bad : unstorable()) {
        const Item change = Item::map({{"election", 1}, {"extension", bad}});
        cases.push_back({"annotate", applying(change, {b}), extension, "", 0});
    }
    // Small enough by itself, but not together with the election that "b" has.
    const Item large = Item::map({{"x", std::string(65'515, 'x')}});
    cases.push_back(
        {"annotate", applying(Item::map({{"extension", large}}), {d, b}), extension, "d", 0});
    expect(cases);
    EXPECT_EQ(world.annotations().at("a"),
              Item::map({{"election", true}, {"extension", deep(61)}}));
    Daemon& daemon = *world.daemon;
    EXPECT_EQ(daemon.terminate(), 0); // the log is complete
    EXPECT_EQ(daemon.linesWith("traffic default: Paths present but not an array (ignoring values)"),
              1U);
    EXPECT_EQ(daemon.linesWith(
                  "traffic default: Paths present but has different count than UUIDs (ignoring)"),
              1U);
    const std::string missed = std::string("plugin by ") + unknownPlugIn;
    EXPECT_EQ(daemon.linesWith("traffic info: Failed to find " + missed), 4U);
    EXPECT_EQ(daemon.linesWith(std::string("traffic info: Looking for plugin ") + unknownPlugIn +
                               " by path /no\\nwhere"),
              1U);
    const std::string client =
        "client " + std::to_string(getpid()) + " plug-in a(" + world.uuids.at("a") + ") ";
    EXPECT_EQ(daemon.linesWith("ops info: " + client + "election := true"), 1U);
    EXPECT_EQ(daemon.linesWith("ops debug: " + client + "annotation change: {\"election\""), 7U);
}

TEST_F(AnnotateTest, AppliesAnExtensionToEach) {
    const char* const dictionary = "4 invalid request format (bad annotations dictionary)";
    const char* const value = "18 annotations values must be dictionaries";
    const std::string uuidA = world.uuids.at("a");
    const std::string uuidB = world.uuids.at("b");
    const auto bulk = [](std::initializer_list<Item::Pair> extensions) {
        return Item::map({{"annotations", Item::map(extensions)}});
    };
    std::vector<Case> cases = {
        {"bulk-annotate", Item::map({}), dictionary, "", 0},
        {"bulk-annotate", Item::map({{"annotations", 1}}), dictionary, "", 0},
        {"bulk-annotate", bulk({}), "", "", 1},
        {"bulk-annotate", bulk({{uuidA, change()}, {uuidB, change()}}), "", "a b", 1},
        {"bulk-annotate", bulk({{uuidA, change()}, {"~", 5}}), value, "a", 0},
        {"bulk-annotate", bulk({{uuidA, change()}, {"~", change()}}),
         "18 invalid plug-in UUID value", "a", 0},
        {"bulk-annotate", bulk({{unknownPlugIn, change()}}), "2 no plug-in with the requested uuid",
         "", 0}};
    for (const Item& bad : unstorable())
        cases.push_back({"bulk-annotate", bulk({{uuidA, change()}, {"~", bad}}), value, "", 0});
    expect(cases);
    EXPECT_TRUE(world.annotations().at("a").has("extension"));
    EXPECT_FALSE(world.annotations().at("a").has("election"));
    EXPECT_EQ(world.daemon->terminate(), 0);
    EXPECT_EQ(world.daemon->linesWith("ops debug: client " + std::to_string(getpid()) +
                                      " bulk plug-in a(" + uuidA + "ublic}@) annotation change: {"),
              3U);
    EXPECT_GE(world.daemon->linesWith("ops debug: bulk change requested for 2 plug-ins"), 3U);
}

} // namespace
} // namespace e2e
