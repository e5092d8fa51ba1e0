#include "zpctl/Table.h"

#include <sstream>
#include <string>

#include <gtest/gtest.h>

#include "zpctl/Printable.h"

namespace {

using zpctl::Paint;
using zpctl::printable;
using zpctl::Table;
using zpctl::Tone;

std::string written(const Table& table, bool inColour) {
    std::ostringstream out;
    table.write(out, Paint(inColour));
    return out.str();
}

TEST(Printable, KeepsTextAndEscapesWhatCouldDisturbATerminal) {
    using namespace std::string_literals;

    const std::pair<std::string, std::string> cases[] = {
        {"", ""},
        {"Décalage 字幕 😀", "Décalage 字幕 😀"},
        {"a\nb\x1b[31m\t\x7f", R"(a\u{a}b\u{1b}[31m\u{9}\u{7f})"},
        {"\0x"s, R"(\u{0}x)"},
        {"\xc2\x9b", R"(\u{9b})"},       // a control character of the second set
        {"\xe2\x80\xae", R"(\u{202e})"}, // turns the direction of writing
        {"\xff\xc3", R"(\xff\xc3)"},     // no lead byte; cut short
        {"\xc0\xaf\xed\xa0\x80", R"(\xc0\xaf\xed\xa0\x80)"}, // too long a form; a surrogate
        {"\xf4\x90\x80\x80", R"(\xf4\x90\x80\x80)"},         // beyond the last character
    };

    for (const auto& [text, shown] : cases)
        EXPECT_EQ(printable(text), shown);
}

TEST(Table, SetsColumnsBelowEachOtherWithoutBlanksAtTheEnd) {
    Table table({{"NAME"}, {"VERSION"}, {"UUID"}});
    table.add({"a", "1.10", "x"});
    table.add({"é", "", ""});
    table.add({"longest", "", "y"});
    EXPECT_EQ(written(table, false), "NAME     VERSION  UUID\n"
                                     "a        1.10     x\n"
                                     "é\n"
                                     "longest           y\n");
}

TEST(Table, EscapesCellsAndPaintsOnlyWhenAsked) {
    Table table({{"", Tone::strong}, {""}, {"", Tone::faint}});
    table.add({"a\x1b", "b", "c"});
    EXPECT_EQ(written(table, false), "a\\u{1b}  b  c\n");
    EXPECT_EQ(written(table, true), "\x1b[1ma\\u{1b}\x1b[0m  b  \x1b[2mc\x1b[0m\n");
}

} // namespace
