#include "platform/plist/PropertyList.h"

#include <limits>
#include <string>

#include <gmock/gmock.h>

using namespace platform;
using testing::HasSubstr;

namespace {

std::string document(std::string_view content) {
    return "<?xml version=\"1.0\"?>\n<plist version=\"1.0\">" + std::string(content) + "</plist>";
}

std::string reason(const std::expected<Value, Error>& result) {
    return result ? "accepted: " + describe(*result) : result.error().description.value_or("");
}

std::string nested(std::size_t levels) {
    std::string text;
    for (std::size_t i = 0; i < levels; ++i)
        text += "<array>";
    for (std::size_t i = 0; i < levels; ++i)
        text += "</array>";
    return text;
}

} // namespace

TEST(PropertyListXml, ReadsEachKindOfValue) {
    const std::pair<const char*, Value> cases[] = {
        {"<string>a &lt;b&gt; &amp; &#233; <![CDATA[<c>]]>\n </string>", "a <b> & \xc3\xa9 <c>\n "},
        {"<string/>", ""},
        {"<true/>", true},
        {"<false></false>", false},
        {"<integer>0</integer>", 0},
        {"<integer> -7 </integer>", -7},
        {"<integer>+0x1F</integer>", 31},
        {"<integer>18446744073709551615</integer>", std::numeric_limits<std::uint64_t>::max()},
        {"<integer>-9223372036854775808</integer>", std::numeric_limits<std::int64_t>::min()},
        {"<real>-2.5e3</real>", -2500.0},
        {"<real>+1</real>", 1.0},
        {"<date>2026-11-22T22:05:00Z</date>", Date{1795385100}},
        {"<date>1969-12-31T23:59:59Z</date>", Date{-1}},
        {"<date> 1969-12-31T23:59:58.750Z </date>", Date{-1.25}},
        {"<data>AAEC\n\t/w==</data>", Data{SharedBytes(std::string_view("\0\1\2\xff", 4))}},
        {"<data></data>", Data{}},
        {"<array><integer>1</integer><array/></array>", Array{1, Array{}}},
        {"<dict><key>b</key><true/><key>a</key><string>x</string></dict>",
         Dictionary{{"a", "x"}, {"b", true}}},
        {"<dict><key>a</key><integer>1</integer><key>a</key><integer>2</integer></dict>",
         Dictionary{{"a", 2}}},
    };

    for (const auto& [text, expected] : cases) {
        const auto value = plist::parse(document(text));
        ASSERT_TRUE(value) << text << ": " << reason(value);
        EXPECT_EQ(*value, expected) << text;
        EXPECT_EQ(value->kind(), expected.kind()) << text;
    }
}

TEST(PropertyListXml, AcceptsADocumentTypeAndComments) {
    const auto value =
        plist::parse("<!DOCTYPE plist PUBLIC \"-//X//DTD\" \"http://x.invalid/p.dtd\">"
                     "<!-- c --><plist> <!-- c --> <dict> </dict>\n</plist>\n");
    EXPECT_EQ(value, Dictionary());
}

TEST(PropertyListXml, RefusesEverythingElse) {
    const std::pair<const char*, std::vector<std::string>> cases[] = {
        {"no element found", {""}},
        {"syntax error", {"text"}},
        {"no value", {document("")}},
        {"a value where none belongs",
         {"<dict/>", document("<true/><true/>"), document("<dict><true/></dict>"),
          document("<dict><key>a</key><dict><array/></dict></dict>")}},
        {"mismatched tag", {document("<array><true></array>")}},
        {"junk after", {document("<true/>") + "<plist/>"}},
        {"a plist inside a plist", {document("<plist><true/></plist>")}},
        {"an unknown element", {document("<array><other/></array>")}},
        {"text between values", {document("<array><true/>text</array>")}},
        {"an attribute", {document("<string a='b'>x</string>")}},
        {"an element inside a simple value", {document("<string>x<true/></string>")}},
        {"a key where a value belongs",
         {document("<key>a</key>"), document("<array><key>a</key></array>"),
          document("<dict><key>a</key><key>b</key></dict>")}},
        {"a key without value", {document("<dict><key>a</key></dict>")}},
        {"invalid token", {document("<string>\xff</string>")}},
        {"undefined entity", {document("<string>&unknown;</string>")}},
        {"an unknown entity",
         {"<!DOCTYPE plist SYSTEM \"file:///etc/passwd\"><plist><string>&x;</string></plist>"}},
    };

    for (const auto& [complaint, texts] : cases) {
        for (const std::string& text : texts)
            EXPECT_THAT(reason(plist::parse(text)), HasSubstr(complaint)) << text;
    }
}

TEST(PropertyListXml, RefusesMalformedValues) {
    const std::pair<const char*, std::vector<const char*>> cases[] = {
        {"true", {"x"}},
        {"integer", {"", "1 2", "--1", "18446744073709551616", "-9223372036854775809", "0x"}},
        {"real", {"nan", "1e999"}},
        {"date",
         {"2026-02-29T00:00:00Z", "2026-11-22T24:00:00Z", "2026-11-22 22:05:00Z",
          "2026-11-22T22:05:00.Z", "2026-11-22T22:05:00.5", "2026-11-22T22:05:00.1e3Z"}},
        {"data", {"AAE", "A=E=", "A!=="}},
    };
    for (const auto& [element, contents] : cases) {
        const std::string name = element;
        for (const std::string content : contents) {
            const auto text = document("<" + name + ">" + content + "</" + name + ">");
            EXPECT_THAT(reason(plist::parse(text)), HasSubstr("a malformed value")) << text;
        }
    }
}

TEST(PropertyListXml, RefusesEntityDeclarationsBeforeTheyGrow) {
    std::string bomb = "<!DOCTYPE plist [<!ENTITY a0 \"aaaaaaaaaa\">";
    for (int i = 1; i < 20; ++i) {
        const std::string inner = "&a" + std::to_string(i - 1) + ";";
        bomb += "<!ENTITY a" + std::to_string(i) + " \"";
        for (int k = 0; k < 10; ++k)
            bomb += inner;
        bomb += "\">";
    }
    bomb += "]><plist><string>&a19;</string></plist>";
    EXPECT_THAT(reason(plist::parse(bomb)), HasSubstr("declarations in the document type"));
    EXPECT_THAT(reason(plist::parse("<!DOCTYPE plist []><plist><true/></plist>")),
                HasSubstr("declarations"));
}

TEST(PropertyListXml, IsBoundedInNesting) {
    EXPECT_TRUE(plist::parse(document(nested(plist::deepestNesting))));
    EXPECT_THAT(reason(plist::parse(document(nested(plist::deepestNesting + 1)))),
                HasSubstr("nested too deeply"));
    EXPECT_THAT(reason(plist::parse(document(nested(1'000'000)))), HasSubstr("nested too deeply"));
    EXPECT_TRUE(plist::parse(document(nested(3)), 3));
    EXPECT_FALSE(plist::parse(document(nested(4)), 3));
}

TEST(PropertyListXml, SurvivesTruncationAtEveryLength) {
    const auto whole = plist::writeXml(Dictionary{{"a", Array{1, -2, 2.5, "x & y", true}},
                                                  {"b", Dictionary{{"c", Data{SharedBytes("d")}}}},
                                                  {"d", Date{0}}});
    ASSERT_TRUE(whole);
    const std::size_t end = whole->rfind('>') + 1;
    for (std::size_t length = 0; length < end; ++length)
        EXPECT_FALSE(plist::parse(whole->substr(0, length))) << length;
    EXPECT_TRUE(plist::parse(*whole));
}

TEST(PropertyListXml, WritesWhatItReads) {
    std::string everyByte;
    for (int i = 0; i < 256; ++i)
        everyByte += static_cast<char>(i);
    std::vector<Value> values = {true,
                                 false,
                                 0,
                                 -1,
                                 std::numeric_limits<std::uint64_t>::max(),
                                 std::numeric_limits<std::int64_t>::min(),
                                 Data{SharedBytes(everyByte)},
                                 Data{SharedBytes(everyByte.substr(0, 254))},
                                 Array{},
                                 Dictionary{},
                                 Array{Array{}, Dictionary{{"", Array{1, "x"}}, {"k<\r", false}}}};
    for (const char* text : {"", "a\r\n\tb <&> \"'\xe2\x82\xac\xf0\x9f\x98\x80 ]]>", "  blanks  "})
        values.emplace_back(text);
    for (const double number : {0.1, -1e300, 5e-324, 3.0})
        values.emplace_back(number);
    for (const double time :
         {0.0, -62167219200.0, 253402300799.99997, 1795385100.1, -0.25, -5e-324, -62167219199.5})
        values.emplace_back(Date{time});
    for (const Value& value : values) {
        const auto text = plist::writeXml(value);
        ASSERT_TRUE(text) << describe(value);
        const auto back = plist::parse(*text);
        ASSERT_TRUE(back) << *text << reason(back);
        EXPECT_EQ(*back, value) << *text;
        EXPECT_EQ(back->kind(), value.kind()) << *text;
    }
}

TEST(PropertyListXml, RefusesToWriteWhatAListCannotHold) {
    const Value values[] = {Value(),
                            Uuid::random(),
                            Url{SharedBytes("file:///x")},
                            Encoded{},
                            std::numeric_limits<double>::infinity(),
                            std::numeric_limits<double>::quiet_NaN(),
                            Date{std::numeric_limits<double>::quiet_NaN()},
                            Date{1e18},
                            std::string_view("\0", 1),
                            "\x1b",
                            "\xef\xbf\xbf",     // U+FFFF
                            "\xed\xa0\x80",     // a surrogate
                            "\xc0\x80",         // overlong
                            "\xf4\x90\x80\x80", // beyond U+10FFFF
                            "cut \xe2\x82"};
    for (const Value& value : values) {
        EXPECT_FALSE(plist::writeXml(value)) << describe(value);
        EXPECT_FALSE(plist::writeXml(Array{1, Dictionary{{"k", value}}})) << describe(value);
    }
    EXPECT_FALSE(plist::writeXml(Dictionary{{"\x01", 1}}));
}
