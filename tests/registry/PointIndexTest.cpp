#include <algorithm>

#include "AppRegistry/ARPointKeys.h"
#include "platform/value/NumericOrder.h"
#include "tests/registry/RegistryFixture.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

// The rule on one text, written again as plainly as it reads: the index must keep all it accepts.
bool accepts(std::string_view value, std::string_view pattern) {
    const auto order = [&](std::size_t from) {
        return platform::compareNumerically(value, pattern.substr(from));
    };
    if (pattern.starts_with('?'))
        return false;
    if (pattern.starts_with("<>"))
        return order(2) != 0;
    if (pattern.starts_with("<="))
        return order(2) <= 0;
    if (pattern.starts_with(">="))
        return order(2) >= 0;
    if (pattern.starts_with('='))
        return order(1) == 0;
    if (pattern.starts_with('<'))
        return order(1) < 0;
    if (pattern.starts_with('>'))
        return order(1) > 0;
    return order(0) == 0;
}

bool keeps(const Value& value, const Value& pattern) {
    const auto wanted = ARPointKeysOfPattern(pattern);
    if (!wanted)
        return true;
    const auto keys = ARPointKeysOf(Dictionary{{"HXExtensionPointIdentifier", value}});
    return std::ranges::any_of(
        keys, [&](const auto& key) { return std::ranges::find(*wanted, key) != wanted->end(); });
}

const char* const texts[] = {
    "",        "a",   "A",   "a1", "a01", "a10",       "a1.10",
    "a01.010", "=a",  "<a",  ">",  "<>a", "<=a",       "?KM",
    "1",       "001", "=<x", "<x", "*",   "a\xc3\xa4", "com.tovana.point2"};
const char* const operators[] = {"", "=", "<", ">", "<>", "<=", ">=", "==", "=<", "?", "?KM-IS:"};

class PointIndex : public RegistryTest {};

} // namespace

TEST(PointKeys, NeverDropWhatTheRuleAccepts) {
    for (const std::string value : texts) {
        for (const std::string op : operators) {
            for (const std::string operand : texts) {
                const std::string pattern = op + operand;
                SCOPED_TRACE(value + " against " + pattern);
                if (!accepts(value, pattern))
                    continue;
                EXPECT_TRUE(keeps(value, pattern));
                EXPECT_TRUE(keeps(Array{1, value, "other"}, pattern));
                EXPECT_TRUE(keeps(value, Array{"other", 7, pattern}));
                EXPECT_TRUE(keeps(Array{"x", value}, Array{pattern, Array{}}));
            }
        }
    }
}

TEST(PointKeys, NarrowDownByEqualityAlone) {
    EXPECT_TRUE(ARPointKeysOfPattern("a"));
    EXPECT_TRUE(ARPointKeysOfPattern("=a"));
    EXPECT_EQ(ARPointKeysOfPattern(Array{})->size(), 0U);
    EXPECT_EQ(ARPointKeysOfPattern(Array{"a1", "=a01", 3})->size(), 1U);
    for (const Value& pattern :
         {Value(true), Value(0), Value(1.0), Value("<>a"), Value("?a"), Value(Dictionary{}),
          Value(7), Value(nullptr), Value(Array{"a", ">b"})})
        EXPECT_FALSE(ARPointKeysOfPattern(pattern)) << describe(pattern);
}

TEST_F(PointIndex, FollowsTheAttributeBeforeTheInfoDictionary) {
    const auto make = [this](const char* name, const Dictionary& extension) {
        Dictionary info = plugInInfo(name, "");
        info.set("HXExtension", extension);
        makeBundle(std::string("Applications/A.app/PlugIns/") + name + ".appex", info);
    };
    makeApplication("Applications/A.app", "com.example.a");
    const char* const key = "HXExtensionPointIdentifier";
    make("1", {{key, "point"}});
    make("2", {{key, "point"}, {"HXExtensionAttributes", Dictionary{{key, "other"}}}});
    make("3", {{key, "none"},
               {"HXExtensionAttributes", Dictionary{{key, Array{"point", "other", "point"}}}}});
    make("4", {{key, "point"}, {"HXExtensionAttributes", Dictionary{{key, 3}}}});
    make("5", {});
    open();
    for (int round = 0; round < 2; ++round) { // just read, and from the database
        EXPECT_EQ(matching("point"), (Strings{"1", "3"}));
        EXPECT_EQ(matching("=other"), (Strings{"2", "3"}));
        EXPECT_EQ(matching(Array{"other", "point"}), (Strings{"1", "2", "3"}));
        EXPECT_EQ(matching("absent"), Strings());
        EXPECT_EQ(matching(Array{}), Strings());
        EXPECT_EQ(matching(false), (Strings{"1", "2", "3", "4", "5"}));
        EXPECT_EQ(matching("<>point"), (Strings{"1", "2", "3", "4", "5"}));
        open();
    }
}
