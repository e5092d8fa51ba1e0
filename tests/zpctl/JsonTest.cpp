#include "zpctl/Json.h"

#include <limits>
#include <string>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

namespace {

using platform::Array;
using platform::Data;
using platform::Dictionary;
using platform::SharedBytes;
using platform::Url;
using platform::Uuid;
using platform::Value;
using namespace std::string_view_literals;

TEST(Json, WritesEachKindOfValue) {
    const Uuid uuid = *Uuid::parse("0f8fad5b-d9cb-469f-a165-70867728950e");

    const std::pair<Value, std::string> cases[] = {
        {nullptr, "null"},
        {true, "true"},
        {-7, "-7"},
        {std::numeric_limits<std::uint64_t>::max(), "18446744073709551615"},
        {0.5, "0.5"},
        {"text", "\"text\""},
        {uuid, "\"0F8FAD5B-D9CB-469F-A165-70867728950E\""},
        {Url{SharedBytes("file:///x"sv)}, "\"file:///x\""},
        {Array{1, Array{}}, "[1,[]]"},
        {Dictionary{{"b", 1}, {"a", Dictionary{}}}, R"({"a":{},"b":1})"},
    };

    for (const auto& [value, json] : cases)
        EXPECT_EQ(zpctl::toJson(value).dump(), json);
}

TEST(Json, WritesDataAsBase64) {
    const std::pair<std::string_view, std::string> cases[] = {
        {"", ""},        {"f", "Zg=="},        {"fo", "Zm8="},
        {"foo", "Zm9v"}, {"foob", "Zm9vYg=="}, {"\xff\xfe\xfd\x00"sv, "//79AA=="}};

    for (const auto& [bytes, text] : cases)
        EXPECT_EQ(zpctl::toJson(Data{SharedBytes(bytes)}).dump(), '"' + text + '"');
}

TEST(Json, WritesDatesInUtc) {
    const std::pair<double, std::string> cases[] = {
        {0, "1970-01-01T00:00:00Z"},
        {1795385274, "2026-11-22T22:07:54Z"},
        {1.0625, "1970-01-01T00:00:01.063Z"},
        {-0.25, "1969-12-31T23:59:59.750Z"},
        {1.9999, "1970-01-01T00:00:02Z"},
        {1e300, "out of range"},
        {std::numeric_limits<double>::quiet_NaN(), "out of range"},
    };

    for (const auto& [seconds, text] : cases)
        EXPECT_EQ(zpctl::dateText({seconds}), text);
}

TEST(Json, TextIsAsciiAndEndsWithALineFeed) {
    EXPECT_EQ(zpctl::jsonText(zpctl::toJson(Array{"é\x1b\xff"})),
              "[\n  \"\\u00e9\\u001b\\ufffd\"\n]\n");
}

} // namespace
