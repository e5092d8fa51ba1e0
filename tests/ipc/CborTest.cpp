#include "platform/ipc/Cbor.h"

#include <cmath>
#include <cstdint>
#include <limits>
#include <string>

#include <gtest/gtest.h>

namespace {

using namespace platform;
using namespace platform::ipc;

std::string bytes(std::string hex) {
    std::erase(hex, ' ');
    std::string out;
    for (std::size_t at = 0; at < hex.size(); at += 2)
        out += static_cast<char>(std::stoi(hex.substr(at, 2), nullptr, 16));
    return out;
}

Value data(std::string_view content) {
    return Data{SharedBytes(content)};
}

Value url(std::string_view text) {
    return Url{SharedBytes(text)};
}

const Uuid someUuid = *Uuid::parse("00112233-4455-6677-8899-AABBCCDDEEFF");

struct Example {
    const char* hex;
    Value value;
};

// Appendix A of RFC 8949, as far as the wire has the kinds, and the tags of the wire.
const Example written[] = {
    {"8b 00 01 0a 17 1818 1819 1864 1903e8 1a000f4240 1b000000e8d4a51000 1bffffffffffffffff",
     Array{0, 1, 10, 23, 24, 25, 100, 1000, 1000000, 1000000000000,
           std::numeric_limits<std::uint64_t>::max()}},
    {"85 20 29 3863 3903e7 3b7fffffffffffffff",
     Array{-1, -10, -100, -1000, std::numeric_limits<std::int64_t>::min()}},
    {"84 fb3ff199999999999a fb7e37e43c8800759c fbc010666666666666 fb7ff0000000000000",
     Array{1.1, 1.0e+300, -4.1, std::numeric_limits<double>::infinity()}},
    {"83 f4 f5 f6", Array{false, true, nullptr}},
    {"82 40 4401020304", Array{data(""), data("\x01\x02\x03\x04")}},
    {"87 60 6161 6449455446 62225c 62c3bc 63e6b0b4 64f0908591",
     Array{"", "a", "IETF", "\"\\", "\u00fc", "\u6c34", "\U00010151"}},
    {"80", Array{}},
    {"83 01 820203 820405", Array{1, Array{2, 3}, Array{4, 5}}},
    {"a0", Dictionary{}},
    {"a2 6161 01 6162 820203", Dictionary{{"a", 1}, {"b", Array{2, 3}}}},
    {"82 6161 a1 6162 6163", Array{"a", Dictionary{{"b", "c"}}}},
    {"c1 fb 41d452d9ec200000", Date{1363896240.5}},
    {"d8 20 76 687474703a2f2f7777772e6578616d706c652e636f6d", url("http://www.example.com")},
    {"d8 25 50 00112233445566778899aabbccddeeff", someUuid},
};

TEST(CborTest, WritesAndReadsTheExamplesOfTheStandard) {
    for (const auto& [hex, value] : written) {
        EXPECT_EQ(encode(value), bytes(hex)) << hex;
        const auto read = decode(bytes(hex));
        ASSERT_TRUE(read) << hex;
        EXPECT_EQ(*read, value) << hex;
        EXPECT_EQ(encode(*read), bytes(hex)) << hex << ": of the same kinds";
    }
}

TEST(CborTest, ReadsOtherWidthsThanItWrites) {
    const Example examples[] = {
        {"82 1805 1b0000000000000005", Array{5, 5}}, // longer than need be
        {"87 f90000 f93c00 f97bff f90001 f90400 f9c400 f97c00",
         Array{0.0, 1.0, 65504.0, 5.960464477539063e-8, 0.00006103515625, -4.0,
               std::numeric_limits<double>::infinity()}},
        {"82 fa47c35000 fa7f7fffff", Array{100000.0, 3.4028234663852886e+38}},
        {"83 c11a514b67b0 c120 c1f93c00", Array{Date{1363896240}, Date{-1}, Date{1}}},
        {"a2 6162 01 6161 02", Dictionary{{"a", 2}, {"b", 1}}}, // keys in any order
    };
    for (const auto& [hex, value] : examples) {
        const auto read = decode(bytes(hex));
        ASSERT_TRUE(read) << hex;
        EXPECT_EQ(*read, value) << hex;
    }
    EXPECT_TRUE(std::isnan(*decode(bytes("f9 7e00"))->real()));
}

TEST(CborTest, TruncationAtEveryLengthIsRefused) {
    Dictionary body;
    for (const auto& [hex, value] : written)
        body.set(hex, value);
    const std::string whole = encode(body);
    EXPECT_EQ(*decode(whole), Value(body));
    for (std::size_t length = 0; length < whole.size(); ++length)
        EXPECT_FALSE(decode(std::string_view(whole).substr(0, length))) << length;
}

std::string nested(unsigned depth) {
    return std::string(depth - 1, '\x81') + std::string(1, '\x80');
}

TEST(CborTest, NestingEndsAtSixtyFour) {
    EXPECT_TRUE(decode(nested(64)));
    EXPECT_FALSE(decode(nested(65)));
    EXPECT_FALSE(decode(nested(100'000)));
    // Tags do not count.
    EXPECT_TRUE(decode(std::string(63, '\x81') + bytes("81 c1 00")));
    // What a record holds starts afresh.
    const std::string inner = bytes("d8 18 58 40") + nested(64);
    const auto outer = decode(std::string(64, '\x81') + inner, {.allowEncoded = true});
    ASSERT_TRUE(outer);
    EXPECT_TRUE(decodeRecord(inner));
    EXPECT_FALSE(decodeRecord(bytes("d8 18 58 41") + nested(65)));
}

TEST(CborTest, WritesValidTextWhateverTheValueHolds) {
    EXPECT_EQ(encode("a\xff"), bytes("64 61 efbfbd"));
    EXPECT_EQ(encode(Dictionary{{"\xc3", 1}}), bytes("a1 63 efbfbd 01"));
    Value deep = 1;
    for (int i = 0; i < 200; ++i)
        deep = Array{deep};
    EXPECT_TRUE(decode(encode(deep)));
}

TEST(CborRecordTest, SharesWhatIsEncodedAlready) {
    const Dictionary form{{"path", "/a/b.appex"}, {"lastmodified", Date{12.5}}};
    const SharedBytes item = encodeShared(form);
    const Encoded records = encodeRecordArray({item, item, item});
    int shared = 0;
    for (const SharedBytes& piece : *records.pieces)
        shared += piece.sameAllocation(item) ? 1 : 0;
    EXPECT_EQ(shared, 3);

    const auto reply = decode(encode(Dictionary{{"matches", records}}), {.allowEncoded = true});
    ASSERT_TRUE(reply);
    const Encoded* received = reply->dictionary()->find("matches")->encoded();
    ASSERT_TRUE(received);
    EXPECT_EQ(*decodeRecord(*received), Value(Array{form, form, form}));
    EXPECT_EQ(*decodeRecord(records), Value(Array{form, form, form}));
}

TEST(CborRecordTest, AllWaysOfMakingOneAgree) {
    const Dictionary form{{"a", 1}};
    EXPECT_EQ(encode(encodeRecord(Value(form))), encode(encodeRecord(encodeShared(form))));
    EXPECT_EQ(encode(encodeRecord(Value(Array{form, form}))),
              encode(encodeRecordArray({encodeShared(form), encodeShared(form)})));
    EXPECT_EQ(*decodeRecord(encodeRecordArray({})), Value(Array{}));
}

} // namespace
