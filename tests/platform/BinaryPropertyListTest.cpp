#include <cstdint>
#include <initializer_list>
#include <limits>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "platform/plist/PropertyList.h"

using namespace platform;
using testing::HasSubstr;

namespace {

std::string bytes(std::initializer_list<unsigned> list) {
    std::string out;
    for (const unsigned byte : list)
        out += static_cast<char>(byte);
    return out;
}

std::string bigEndian(std::uint64_t number, std::size_t size = 8) {
    std::string out;
    for (std::size_t i = 0; i < size; ++i)
        out += static_cast<char>(number >> (8 * (size - 1 - i)));
    return out;
}

std::string trailer(std::size_t offsetSize, std::size_t referenceSize, std::uint64_t count,
                    std::uint64_t top, std::uint64_t table) {
    return std::string(6, '\0') + bigEndian(offsetSize, 1) + bigEndian(referenceSize, 1) +
           bigEndian(count) + bigEndian(top) + bigEndian(table);
}

// A list of these objects, the first on top, with two-byte offsets and one-byte references.
std::string list(const std::vector<std::string>& objects) {
    std::string out = "bplist00";
    std::string table;
    for (const std::string& object : objects) {
        table += bigEndian(out.size(), 2);
        out += object;
    }
    return out + table + trailer(2, 1, objects.size(), 0, out.size());
}

std::string reason(const std::expected<Value, Error>& result) {
    return result ? "accepted: " + describe(*result) : result.error().description.value_or("");
}

} // namespace

TEST(PropertyListBinary, ReadsEachKindOfObject) {
    const std::tuple<const char*, std::string, Value> cases[] = {
        {"false", "\x08", false},
        {"true", "\x09", true},
        {"1 byte", bytes({0x10, 0xff}), 255},
        {"2 bytes", bytes({0x11, 0xff, 0xfe}), 65534},
        {"4 bytes", "\x12" + bigEndian(4'000'000'000, 4), 4'000'000'000U},
        {"8 bytes", "\x13" + bigEndian(~std::uint64_t{0}), -1},
        {"16 bytes", "\x14" + bigEndian(0) + bigEndian(~std::uint64_t{0}),
         std::numeric_limits<std::uint64_t>::max()},
        {"16 bytes, negative", "\x14" + bigEndian(~std::uint64_t{0}) + bigEndian(-5), -5},
        {"float", "\x22" + bigEndian(0x3fc00000, 4), 1.5},
        {"double", "\x23" + bigEndian(0xc004000000000000), -2.5},
        {"date", "\x33" + bigEndian(0), Date{978307200}},
        {"data", bytes({0x42, 0x00, 0xff}), Data{SharedBytes(std::string_view("\0\xff", 2))}},
        {"text", bytes({0x53, 'a', 'b', 'c'}), "abc"},
        {"long text", bytes({0x5f, 0x10, 16}) + std::string(16, 'x'), std::string(16, 'x')},
        {"wide text", bytes({0x63, 0x20, 0xac, 0xd8, 0x3d, 0xde, 0x00}),
         "\xe2\x82\xac\xf0\x9f\x98\x80"},
        {"empty array", "\xa0", Array{}},
        {"empty dictionary", "\xd0", Dictionary{}},
    };

    for (const auto& [what, object, expected] : cases) {
        const auto value = plist::parse(list({object}));
        ASSERT_TRUE(value) << what << ": " << reason(value);
        EXPECT_EQ(*value, expected) << what;
        EXPECT_EQ(value->kind(), expected.kind()) << what;
    }
}

TEST(PropertyListBinary, ReadsNestedAndSharedObjects) {
    const std::string whole = list(
        {bytes({0xd2, 1, 2, 3, 1}), bytes({0x51, 'k'}), bytes({0x51, 'm'}), bytes({0xa2, 1, 1})});
    EXPECT_EQ(plist::parse(whole), (Dictionary{{"k", Array{"k", "k"}}, {"m", "k"}}));
}

TEST(PropertyListBinary, RefusesBadObjects) {
    const std::tuple<const char*, std::vector<std::string>, const char*> cases[] = {
        {"null", {std::string(1, '\0')}, "unknown kind"},
        {"fill", {"\x0f"}, "unknown kind"},
        {"unique id", {bytes({0x80, 1})}, "unknown kind"},
        {"set", {"\xc0"}, "unknown kind"},
        {"32-byte integer", {"\x15" + std::string(32, '\0')}, "integer beyond"},
        {"128-bit integer", {"\x14" + bigEndian(1) + bigEndian(0)}, "beyond 64 bits"},
        {"128-bit negative", {"\x14" + bigEndian(~std::uint64_t{0}) + bigEndian(1)}, "beyond"},
        {"cut integer", {bytes({0x13, 0, 0})}, "cut object"},
        {"half float", {bytes({0x21, 0, 0})}, "bad number"},
        {"not a number", {"\x23" + bigEndian(0x7ff8000000000000)}, "bad number"},
        {"float date", {"\x32" + bigEndian(0, 4)}, "bad date"},
        {"cut text", {bytes({0x55, 'a'})}, "cut object"},
        {"cut wide text", {bytes({0x62, 0, 'a', 0})}, "cut object"},
        {"count of text", {bytes({0x5f, 0x51, 'a'})}, "bad count"},
        {"no count", {bytes({0x5f})}, "cut object"},
        {"huge count", {bytes({0x4f, 0x13}) + bigEndian(~std::uint64_t{0})}, "cut object"},
        {"huge array", {bytes({0xaf, 0x13}) + bigEndian(std::uint64_t{1} << 62)}, "cut object"},
        {"huge dictionary", {bytes({0xdf, 0x13}) + bigEndian(std::uint64_t{1} << 63)}, "cut"},
        {"eighth bit", {bytes({0x51, 0x80})}, "ASCII"},
        {"lone surrogate", {bytes({0x62, 0xd8, 0, 0, 'a'})}, "surrogate"},
        {"last surrogate", {bytes({0x61, 0xd8, 0})}, "surrogate"},
        {"no such object", {bytes({0xa1, 1})}, "reference to no object"},
        {"number as key", {bytes({0xd1, 1, 1}), bytes({0x10, 1})}, "key that is not text"},
        {"array as key", {bytes({0xd1, 1, 1}), bytes({0xa0})}, "nested too deeply"},
        {"itself", {bytes({0xa1, 0})}, "nested too deeply"},
        {"a ring",
         {bytes({0xa1, 1}), bytes({0xd1, 2, 0}), bytes({0x51, 'k'})},
         "nested too deeply"},
    };

    for (const auto& [what, objects, complaint] : cases)
        EXPECT_THAT(reason(plist::parse(list(objects))), HasSubstr(complaint)) << what;
}

TEST(PropertyListBinary, RefusesBadTables) {
    const std::string object = "bplist00\x09";
    const auto with = [&](std::string_view table, const std::string& end) {
        return object + std::string(table) + end;
    };
    constexpr std::uint64_t huge = ~std::uint64_t{0};

    const std::pair<const char*, std::string> cases[] = {
        {"no trailer", object},
        {"only a trailer", "bplist00" + trailer(1, 1, 1, 0, 8)},
        {"offset size 0", with("\x08", trailer(0, 1, 1, 0, 9))},
        {"offset size 9", with("\x08", trailer(9, 1, 1, 0, 9))},
        {"reference size 0", with("\x08", trailer(1, 0, 1, 0, 9))},
        {"no objects", with("\x08", trailer(1, 1, 0, 0, 9))},
        {"more objects than offsets", with("\x08", trailer(1, 1, 2, 0, 9))},
        {"huge count", with("\x08", trailer(8, 1, huge, 0, 9))},
        {"top outside", with("\x08", trailer(1, 1, 1, 1, 9))},
        {"table in the magic", with("\x08", trailer(1, 1, 1, 0, 7))},
        {"table in the trailer", with("\x08", trailer(1, 1, 1, 0, 11))},
        {"table far outside", with("\x08", trailer(1, 1, 1, 0, huge))},
        {"object in the magic", with("\x07", trailer(1, 1, 1, 0, 9))},
        {"object in the table", with("\x09", trailer(1, 1, 1, 0, 9))},
    };

    ASSERT_EQ(plist::parse(with("\x08", trailer(1, 1, 1, 0, 9))), Value(true));
    for (const auto& [what, whole] : cases)
        EXPECT_FALSE(plist::parse(whole)) << what;
}

TEST(PropertyListBinary, BoundsWhatSharingCanGrowTo) {
    // Each array holds the next one fourteen times; behind them stands what nothing refers to.
    const auto arrays = [](unsigned levels, std::size_t unused) {
        std::vector<std::string> objects;
        for (unsigned i = 0; i < levels; ++i)
            objects.push_back("\xae" + std::string(14, static_cast<char>(i + 1)));
        objects.push_back("\x09");
        objects.emplace_back(unused, 'x');
        return list(objects);
    };
    EXPECT_TRUE(plist::parse(arrays(2, 0)));
    EXPECT_THAT(reason(plist::parse(arrays(3, 0))), HasSubstr("too many values"));
    EXPECT_TRUE(plist::parse(arrays(4, 60'000)));
    EXPECT_THAT(reason(plist::parse(arrays(5, 60'000))), HasSubstr("too many values"));

    // One text of 30,000 bytes, 10,000 times.
    const std::string text = bytes({0x5f, 0x11}) + bigEndian(30'000, 2) + std::string(30'000, 'x');
    const std::string array =
        bytes({0xaf, 0x11}) + bigEndian(10'000, 2) + std::string(10'000, '\1');
    EXPECT_THAT(reason(plist::parse(list({array, text}))), HasSubstr("too much text"));
}

TEST(PropertyListBinary, SurvivesAnyDamage) {
    const std::string whole =
        list({bytes({0xd2, 1, 2, 3, 4}), bytes({0x51, 'a'}), bytes({0x51, 'b'}),
              bytes({0xa2, 1, 5}), "\x33" + bigEndian(0), bytes({0x61, 0x20, 0xac})});
    ASSERT_TRUE(plist::parse(whole));
    for (std::size_t length = 0; length < whole.size(); ++length)
        EXPECT_FALSE(plist::parse(whole.substr(0, length))) << length;
    int refused = 0;
    for (std::size_t at = 8; at < whole.size(); ++at) {
        for (int bit = 0; bit < 8; ++bit) {
            std::string damaged = whole;
            damaged[at] = static_cast<char>(damaged[at] ^ (1 << bit));
            refused += plist::parse(damaged) ? 0 : 1; // under the sanitizers: no fault either
        }
    }
    EXPECT_GT(refused, 200);
}
