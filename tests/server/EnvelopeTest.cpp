#include <cstdint>
#include <limits>

#include "tests/server/ServerFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

using Envelope = ServerFixture;

TEST_F(Envelope, IsCheckedInOrder) {
    const char* const noType = "4 invalid request format (missing type)";
    const char* const unknown = "4 unrecognized request";

    const struct {
        Dictionary request;
        const char* failure;
    } cases[] = {
        {{}, "7 unsupported protocol version 0 (current 3)"},
        {{{"version", 1}, {"request", "find"}}, "7 unsupported protocol version 1 (current 3)"},
        {{{"version", 4}, {"request", "find"}}, "7 unsupported protocol version 4 (current 3)"},
        {{{"version", 4}}, "7 unsupported protocol version 4 (current 3)"},
        {{{"version", "3"}, {"request", "find"}}, "7 unsupported protocol version 0 (current 3)"},
        {{{"version", true}, {"request", "find"}}, "7 unsupported protocol version 0 (current 3)"},
        {{{"version", 3.0}, {"request", "find"}}, "7 unsupported protocol version 0 (current 3)"},
        {{{"version", -1}, {"request", "find"}}, "7 unsupported protocol version 0 (current 3)"},
        {{{"version", std::numeric_limits<std::uint64_t>::max()}},
         "7 unsupported protocol version 18446744073709551615 (current 3)"},
        {{{"version", (std::uint64_t{1} << 32) + 3}},
         "7 unsupported protocol version 4294967299 (current 3)"},
        {{{"version", 3}}, noType},
        {{{"version", 2}}, noType},
        {{{"version", 3}, {"request", 5}}, noType},
        {{{"version", 3}, {"request", nullptr}}, noType},
        {{{"version", 3}, {"request", ""}}, unknown},
        {{{"version", 3}, {"request", "Match"}}, unknown},
        {{{"version", 3}, {"request", "match "}}, unknown},
        {{{"version", 3}, {"request", std::string("match\0", 6)}}, unknown},
        {{{"version", 3}, {"request", "find"}}, "15 Cannot locate PlugIn"},
        {{{"version", 2}, {"request", "find"}}, "15 Cannot locate PlugIn"},
        {{{"version", 3}, {"request", "match"}}, ""},
    };

    for (const auto& test : cases)
        EXPECT_EQ(failureOf(test.request), test.failure) << describe(test.request);
}

TEST_F(Envelope, Version2GetsNoRecords) {
    const auto plugIn = addPlugIn("com.example.a");
    const Reply found = ask("find", {{"uuids", plugIn->uuid}}, 2);
    const Reply matched = ask("match", {}, 2);
    ASSERT_TRUE(found && matched);
    EXPECT_TRUE(found->empty());
    EXPECT_TRUE(matched->empty());
    EXPECT_TRUE(matchesIn(ask("find", {{"uuids", plugIn->uuid}}, 3)));
}

TEST_F(Envelope, RulesMustBeADictionaryOfModestSize) {
    const std::string bad = "4 invalid request format (bad rules dictionary)";
    const Array many(std::vector<Value>(4097, "x"));
    const std::vector<Value> values = {nullptr, "x", 1, Array(), Dictionary{{"k", many}}};
    for (const Value& rules : values)
        EXPECT_EQ(failureOf({{"version", 3}, {"request", "match"}, {"rules", rules}}), bad);
    EXPECT_EQ(failureOf({{"version", 3}, {"request", "match"}, {"rules", Dictionary()}}), "");
}

TEST_F(Envelope, FlagsOfAnotherTypeReadAsNone) {
    for (const Value& flags : {Value(-1), Value("512"), Value(512.0), Value(nullptr)})
        EXPECT_EQ(failureOf({{"version", 3}, {"request", "match"}, {"flags", flags}}), "");
}

} // namespace
