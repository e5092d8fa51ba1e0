#include <algorithm>

#include <gtest/gtest.h>

#include "AppRegistry/ARPointKeys.h"
#include "tests/model/Samples.h"

using namespace platform;

namespace {

// A record with one attribute, "Key", of this value.
struct AttributeWorld : RecordWorld {
    explicit AttributeWorld(Value value)
        : plugIn(record(samplePlugIn(infoWith(extensionWith({{"Key", std::move(value)}}))))) {}

    [[nodiscard]] bool holds(Value pattern) const {
        return plugIn->match(Dictionary{{"Key", std::move(pattern)}});
    }

    ZPDPlugIn::Ptr plugIn;
};

// Whether the registry's index of extension points keeps a plug-in for this pattern.
bool isKept(const Value& value, const Value& pattern) {
    const auto wanted = ARPointKeysOfPattern(pattern);
    const auto keys = ARPointKeysOf(Dictionary{{"HXExtensionPointIdentifier", value}});
    return !wanted || std::ranges::any_of(keys, [&](const auto& key) {
        return std::ranges::find(*wanted, key) != wanted->end();
    });
}

} // namespace

TEST(Rules, CompareTextsByTheirOperators) {
    using Texts = std::vector<const char*>;

    const struct {
        const char* pattern;
        Texts held; // by these values
        Texts others = {};
    } cases[] = {
        {"a", {"a"}, {"A"}},
        {"", {""}},
        {"=a", {"a"}},
        {"=", {""}},
        {"=<x", {"<x"}, {"a"}},
        {"<>a", {"b"}, {"a"}},
        {"<>", {"a"}, {""}},
        {">=2.10", {"2.10", "2.10.1"}, {"2.9"}},
        {"<=2.10", {"2.9"}, {"2.11"}},
        {"<2", {}, {"2", "10"}},
        {"<10", {"2"}},
        {">9", {"10"}},
        {">10", {}, {"10"}},
        {"<=>", {"="}, {"?"}},
        {"01", {"1"}},
        {"*", {"*"}, {"a"}},
        {"a*", {}, {"ab"}},
        {"?KM-OTHER:a", {}, {"a"}},
        {"?", {}, {"?"}},
    };

    for (const auto& [pattern, held, others] : cases) {
        SCOPED_TRACE(pattern);
        for (const char* value : held)
            EXPECT_TRUE(AttributeWorld(value).holds(pattern)) << value;
        for (const char* value : others)
            EXPECT_FALSE(AttributeWorld(value).holds(pattern)) << value;
    }
}

TEST(Rules, AskHowTypesConform) {
    const auto holds = [](const char* value, const char* pattern) {
        AttributeWorld world(value);
        world.platform.types.conformances = {{"public.png", "public.image"}};
        return world.holds(pattern);
    };
    EXPECT_TRUE(holds("public.png", "?KM-CONFORMS:public.image"));
    EXPECT_FALSE(holds("public.image", "?KM-CONFORMS:public.png"));
    EXPECT_TRUE(holds("public.image", "?KM-IS:public.png"));
    EXPECT_FALSE(holds("public.png", "?KM-IS:public.image"));
}

TEST(Rules, TellWhetherAPropertyIsThere) {
    const std::pair<Value, bool> cases[] = {{"text", true}, {"", true}, {"NO", true},
                                            {true, true},   {7, true},  {Array(), true},
                                            {false, false}, {0, false}, {0.0, false}};

    for (const auto& [value, isThere] : cases) {
        AttributeWorld world(value);
        for (const auto& yes : {Value(true), Value(1), Value(1.0)})
            EXPECT_EQ(world.holds(yes), isThere) << describe(value);
        for (const auto& no : {Value(false), Value(0), Value(0.0)})
            EXPECT_EQ(world.holds(no), !isThere) << describe(value);
    }
    RecordWorld world;
    EXPECT_TRUE(world.record()->match(Dictionary{{"Absent", false}}));
    EXPECT_FALSE(world.record()->match(Dictionary{{"Absent", true}}));
    EXPECT_FALSE(world.record()->match(Dictionary{{"Absent", "<>x"}}));
}

TEST(Rules, HoldForAnyOfSeveral) {
    const std::tuple<Value, Value, bool> cases[] = {
        {Array{"a", "b"}, "b", true},
        {Array{"a", "b"}, Array{"c", "a"}, true},
        {Array{"a", "b"}, Array{"c", "d"}, false},
        {Array{"a", 3}, "3", false},
        {Array{3, "a"}, "a", true},
        {Array(), "a", false},
        {"a", Array{7, "a"}, true},
        {"a", Array(), false},
        {"a", 7, false},
        {"a", nullptr, false},
        {3, "3", false},
        {Dictionary{{"a", 1}}, "a", false},
        {platform::Date{1}, "1", false},
    };

    for (const auto& [value, pattern, holds] : cases) {
        EXPECT_EQ(AttributeWorld(value).holds(pattern), holds)
            << describe(value) << " with " << describe(pattern);
    }
}

TEST(Rules, ReadTheirPropertyWhereTheKeySays) {
    RecordWorld world;
    auto info = infoWith(extensionWith({{"Both", "attribute"}, {"com.tovana.uuid", "no"}}));
    info.set("Both", "info");
    info.set("HXExtensionPointIdentifier", "com.example.point");
    auto plugIn = samplePlugIn(info);
    plugIn->granted = Dictionary{{"right", "x"}, {"off", false}, {"HXExtensionIdentifier", "e"}};
    const auto record = world.record(plugIn);

    const std::tuple<std::string, Value, bool> cases[] = {
        {"Both", "attribute", true},
        {"BQBundleDisplayName", "Sample", true},
        {"HXExtensionPointIdentifier", "com.example.point", true},
        {"com.tovana.uuid", record->uuid().text(), true},
        {"com.tovana.uuid", "no", false},
        {"HXExtensionIdentifier", "com.example.sample", true},
        {"HXExtensionContainingApp", "/Applications/Host.app", true},
        {"ENTITLEMENT:right", true, true},
        {"ENTITLEMENT:right", "=x", true},
        {"ENTITLEMENT:right", "=y", false},
        {"ENTITLEMENT:off", false, true},
        {"ENTITLEMENT:absent", false, true},
        {"ENTITLEMENT:HXExtensionIdentifier", "e", true},
        {"ENTITLEMENT:", true, false},
    };

    for (const auto& [key, pattern, holds] : cases)
        EXPECT_EQ(record->match(Dictionary{{key, pattern}}), holds)
            << key << " with " << describe(pattern);
}

TEST(Rules, AboutTheContainingApplicationFailWithoutOne) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    plugIn->application.reset();
    plugIn->path = "/System/Library/X.appex";
    const auto record = world.record(plugIn);
    for (const auto& pattern : {Value(false), Value(true), Value("<>x")})
        EXPECT_FALSE(record->match(Dictionary{{"HXExtensionContainingApp", pattern}}));
}

TEST(Rules, CompareElectionsWithoutTheirSecondByte) {
    RecordWorld world;
    const auto record = world.record();
    const std::pair<std::optional<Value>, const char*> cases[] = {
        {std::nullopt, "0"}, {0, "0"},       {1, "1"},    {257, "1"},
        {65537, "65537"},    {-1, "-65281"}, {true, "1"}, {"1", "0"},
    };
    for (const auto& [election, text] : cases) {
        world.annotations.stored =
            election ? Dictionary{{"election", *election}} : Dictionary{{"other", 1}};
        EXPECT_TRUE(record->match(Dictionary{{"HXUserElection", text}})) << text;
    }
    world.annotations.stored.reset();
    EXPECT_TRUE(record->match(Dictionary{{"HXUserElection", "0"}}));
    EXPECT_TRUE(record->match(Dictionary{{"HXUserElection", true}})); // the text "0" is there
}

TEST(Rules, AcceptNothingThatTheIndexDrops) {
    const std::string texts[] = {
        "",        "a",   "A",   "a1", "a01", "a10",       "a1.10",
        "a01.010", "=a",  "<a",  ">",  "<>a", "<=a",       "?KM",
        "1",       "001", "=<x", "<x", "*",   "a\xc3\xa4", "com.tovana.point2"};
    for (const std::string& value : texts) {
        const AttributeWorld world(value);
        for (const std::string op :
             {"", "=", "<", ">", "<>", "<=", ">=", "==", "=<", "?", "?KM-IS:"}) {
            for (const std::string& operand : texts) {
                const std::string pattern = op + operand;
                SCOPED_TRACE(value + " against " + pattern);
                if (!world.holds(pattern))
                    continue;
                EXPECT_TRUE(isKept(value, pattern));
                EXPECT_TRUE(isKept(Array{1, value, "other"}, pattern));
                EXPECT_TRUE(isKept(value, Array{"other", 7, pattern}));
                EXPECT_TRUE(isKept(Array{"x", value}, Array{pattern, Array{}}));
            }
        }
    }
}
