#include "platform/value/Value.h"

#include <cmath>
#include <limits>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "platform/value/NumericOrder.h"

using namespace platform;

namespace {

constexpr double twoTo53 = 9007199254740992.0;
constexpr double twoTo63 = 9223372036854775808.0;
constexpr double twoTo64 = 18446744073709551616.0;
constexpr auto mostUnsigned = std::numeric_limits<std::uint64_t>::max();
constexpr auto leastSigned = std::numeric_limits<std::int64_t>::min();

} // namespace

TEST(Value, ComparesNumbersByValueAcrossKinds) {
    const std::tuple<Value, Value, bool> cases[] = {
        {true, 1, true},
        {true, 1.0, true},
        {false, 0U, true},
        {false, -0.0, true},
        {true, 2, false},
        {true, false, false},
        {-1, -1.0, true},
        {-1, mostUnsigned, false},
        {5, 5.5, false},
        {std::uint64_t{1} << 53, twoTo53, true},
        {(std::uint64_t{1} << 53) + 1, twoTo53, false}, // equal once rounded
        {mostUnsigned, twoTo64, false},
        {std::numeric_limits<std::int64_t>::max(), twoTo63, false},
        {leastSigned, -twoTo63, true},
        {0, std::nan(""), false},
        {std::nan(""), std::nan(""), false},
        {mostUnsigned, std::numeric_limits<double>::infinity(), false},
        {true, "1", false},
        {0, Value(), false},
        {Date{1}, 1, false},
    };

    for (const auto& [a, b, equal] : cases) {
        EXPECT_EQ(a == b, equal) << describe(a) << " " << describe(b);
        EXPECT_EQ(b == a, equal) << describe(b) << " " << describe(a);
    }
}

TEST(Value, ComparesOtherKindsByContent) {
    const Uuid uuid = Uuid::random();
    const std::vector<Value> different = {
        Value(),
        true,
        2,
        2.5,
        "a",
        "b",
        std::string_view("a\0", 2),
        Date{0},
        Data{SharedBytes("a")},
        uuid,
        Url{SharedBytes("a")},
        Array{},
        Array{"a"},
        Array{"a", "a"},
        Dictionary{},
        Dictionary{{"a", 1}},
        Dictionary{{"a", 2}},
        Dictionary{{"a", 1}, {"b", 1}},
    };
    for (std::size_t i = 0; i < different.size(); ++i) {
        for (std::size_t k = 0; k < different.size(); ++k)
            EXPECT_EQ(different[i] == different[k], i == k) << i << " " << k;
    }
    EXPECT_EQ(Value(uuid), Value(*Uuid::parse(uuid.text())));
    EXPECT_EQ(Value(Array{1, Dictionary{{"a", true}}}), Value(Array{1.0, Dictionary{{"a", 1}}}));
}

TEST(Value, TakesAnyNumberWhereANumberIsAskedFor) {
    const std::tuple<Value, std::optional<std::int64_t>, std::optional<bool>> cases[] = {
        {true, 1, true},
        {-7, -7, true},
        {mostUnsigned, std::numeric_limits<std::int64_t>::max(), true},
        {2.9, 2, true},
        {-2.9, -2, true},
        {0.4, 0, true},
        {-0.0, 0, false},
        {1e300, std::numeric_limits<std::int64_t>::max(), true},
        {-1e300, leastSigned, true},
        {std::nan(""), std::nullopt, true},
        {"1", std::nullopt, std::nullopt},
        {Value(), std::nullopt, std::nullopt},
    };

    for (const auto& [value, integer, truth] : cases) {
        EXPECT_EQ(value.integerValue(), integer) << describe(value);
        EXPECT_EQ(value.booleanValue(), truth) << describe(value);
    }
}

TEST(Dictionary, KeepsKeysInOrderAndTheLastOfEqualOnes) {
    std::vector<DictionaryEntry> entries;
    for (const char* key : {"b", "a", "b", "", "a", "c", "b"})
        entries.push_back({SharedBytes(key), static_cast<int>(entries.size())});
    const Dictionary dictionary(std::move(entries));
    EXPECT_EQ(describe(dictionary), "{\"\": 3, \"a\": 4, \"b\": 6, \"c\": 5}");
    EXPECT_EQ(*dictionary.find("b"), Value(6));
    EXPECT_FALSE(dictionary.find("ab"));
    EXPECT_FALSE(Dictionary().find(""));
}

TEST(Dictionary, CopiesOnlyWhenSharedAndChanged) {
    Dictionary original{{"a", 1}, {"b", 2}};
    Dictionary copy = original;
    EXPECT_TRUE(copy.sameObject(original));
    copy.remove("missing");
    EXPECT_TRUE(copy.sameObject(original));
    copy.set("a", 5);
    EXPECT_FALSE(copy.sameObject(original));
    EXPECT_EQ(*original.find("a"), Value(1));
    EXPECT_EQ(*copy.find("a"), Value(5));

    const DictionaryEntry* place = copy.begin();
    copy.set("a", 6);
    EXPECT_EQ(copy.begin(), place) << "nobody else has it";
    copy.remove("a");
    copy.remove("b");
    EXPECT_TRUE(copy.sameObject(Dictionary()));
}

TEST(Dictionary, HoldsItselfAsItWas) {
    Dictionary dictionary{{"a", 1}};
    dictionary.set("self", dictionary);
    EXPECT_EQ(dictionary, (Dictionary{{"a", 1}, {"self", Dictionary{{"a", 1}}}}));
    Array array{1};
    array.append(array);
    EXPECT_EQ(array, (Array{1, Array{1}}));
}

TEST(Array, CopiesOnlyWhenSharedAndChanged) {
    Array original{1};
    Array copy = original;
    EXPECT_EQ(copy.begin(), original.begin());
    copy.append(2);
    EXPECT_EQ(original, Array{1});
    EXPECT_EQ(copy, (Array{1, 2}));
    EXPECT_TRUE(copy[2].isNull()) << "beyond its end";
}

TEST(Uuid, ReadsBothCasesAndWritesUpper) {
    const auto uuid = Uuid::parse("00112233-4455-6677-8899-aabbCCDDeeff");
    ASSERT_TRUE(uuid);
    EXPECT_EQ(uuid->text(), "00112233-4455-6677-8899-AABBCCDDEEFF");
    EXPECT_EQ(Uuid::fromBytes(std::as_bytes(std::span(uuid->bytes))), uuid);
    for (const char* bad :
         {"", "00112233-4455-6677-8899-aabbccddeef", "00112233-4455-6677-8899-aabbccddeefff",
          "00112233445566778899aabbccddeeff", "0011223g-4455-6677-8899-aabbccddeeff",
          "00112233-4455-6677-8899_aabbccddeeff", "{0112233-4455-6677-8899-aabbccddeef}"})
        EXPECT_FALSE(Uuid::parse(bad)) << bad;
    std::set<Uuid> made;
    for (int i = 0; i < 100; ++i)
        made.insert(Uuid::random());
    EXPECT_EQ(made.size(), 100U);
    EXPECT_EQ(made.begin()->text()[14], '4') << "the version";
}

TEST(NumericOrder, ComparesDigitRunsByValue) {
    const std::tuple<const char*, const char*, std::weak_ordering> cases[] = {
        {"1.10", "1.9", std::weak_ordering::greater},
        {"1.2", "1.2.0", std::weak_ordering::less},
        {"", "0", std::weak_ordering::less},
        {"007", "7", std::weak_ordering::equivalent},
        {"0", "000", std::weak_ordering::equivalent},
        {"a01b", "a1b", std::weak_ordering::equivalent},
        {"a01c", "a1b", std::weak_ordering::greater},
        {"a", "B", std::weak_ordering::greater},
        {"1a", "1b", std::weak_ordering::less},
        {"9", "a", std::weak_ordering::less},
        {"\xc3\xa9", "z", std::weak_ordering::greater},
        {"18446744073709551616", "18446744073709551615", std::weak_ordering::greater},
        {"99999999999999999999999", "100000000000000000000000", std::weak_ordering::less},
    };

    for (const auto& [a, b, order] : cases) {
        EXPECT_EQ(compareNumerically(a, b), order) << a << " " << b;
        EXPECT_EQ(compareNumerically(b, a), 0 <=> order) << a << " " << b;
        EXPECT_EQ(numericEqualityKey(a) == numericEqualityKey(b), order == 0) << a << " " << b;
    }
}
