#include "zpctl/Rules.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "tests/platform/TestFolder.h"
#include "zpctl/DictionaryFile.h"

using platform::Array;
using platform::Dictionary;

namespace {

using Arguments = std::vector<std::string>;

TEST(Rules, ReadPatternsAsStringsBooleansAndAlternatives) {
    const std::pair<Arguments, Dictionary> cases[] = {
        {{}, {}},
        {{"a=b"}, {{"a", "b"}}},
        {{"a="}, {{"a", ""}}},
        {{"v=>=1.10"}, {{"v", ">=1.10"}}},
        {{"v=<=>"}, {{"v", "<=>"}}},
        {{"a=true", "b=false"}, {{"a", true}, {"b", false}}},
        {{"a==true", "b=True", "c=1"}, {{"a", "=true"}, {"b", "True"}, {"c", "1"}}},
        {{"a=x", "b=y", "a=z"}, {{"a", Array{"x", "z"}}, {"b", "y"}}},
    };

    for (const auto& [arguments, rules] : cases)
        EXPECT_EQ(zpctl::rulesFromArguments(arguments).value(), rules)
            << testing::PrintToString(arguments);
}

TEST(Rules, RefuseWhatIsNoRule) {
    for (const Arguments& arguments : {Arguments{"a"}, {"=b"}, {""}, {"a=b", "a=true"}})
        EXPECT_FALSE(zpctl::rulesFromArguments(arguments)) << testing::PrintToString(arguments);
}

class RulesFile : public testing::Test {
protected:
    auto rulesOf(const std::string& content) {
        folder_.write("rules", "<plist version=\"1.0\">" + content + "</plist>");
        return zpctl::dictionaryFromFile(path_);
    }

    TestFolder folder_;
    const std::string path_ = folder_ / "rules";
};

TEST_F(RulesFile, HoldsOneDictionary) {
    const auto rules =
        rulesOf("<dict><key>a</key><array><string>x</string></array><key>b</key><true/></dict>");
    EXPECT_EQ(rules.value(), (Dictionary{{"a", Array{"x"}}, {"b", true}}));
}

TEST_F(RulesFile, TellsWhichFileIsWrong) {
    EXPECT_EQ(rulesOf("<array/>").error(), path_ + ": not a dictionary");
    EXPECT_TRUE(rulesOf("<dict>").error().starts_with(path_ + ": "));
    std::filesystem::remove(path_);
    EXPECT_NE(zpctl::dictionaryFromFile(path_).error().find(path_), std::string::npos);
}

} // namespace
