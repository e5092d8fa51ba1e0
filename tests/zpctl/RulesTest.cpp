#include "zpctl/Rules.h"

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

using platform::Array;
using platform::Dictionary;

namespace {

using Arguments = std::vector<std::string>;

TEST(Rules, ReadPatternsAsStringsBooleansAndAlternatives) {
    const struct {
        Arguments arguments;
        Dictionary rules;
    } cases[] = {
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
    for (const Arguments& arguments : {Arguments{"a"}, {"=b"}, {""}, {"a=b", "a=true"}}) {
        const auto rules = zpctl::rulesFromArguments(arguments);
        EXPECT_FALSE(rules) << testing::PrintToString(arguments);
    }
}

class RulesFile : public testing::Test {
protected:
    void SetUp() override {
        char name[] = "/tmp/zpctl-rules-XXXXXX";
        const int fd = mkstemp(name);
        ASSERT_GE(fd, 0);
        close(fd);
        path_ = name;
    }

    void TearDown() override { std::remove(path_.c_str()); }

    auto rulesOf(const std::string& content) {
        std::ofstream(path_) << "<plist version=\"1.0\">" << content << "</plist>";
        return zpctl::rulesFromFile(path_);
    }

    std::string path_;
};

TEST_F(RulesFile, HoldsOneDictionary) {
    const auto rules =
        rulesOf("<dict><key>a</key><array><string>x</string></array><key>b</key><true/></dict>");
    EXPECT_EQ(rules.value(), (Dictionary{{"a", Array{"x"}}, {"b", true}}));
}

TEST_F(RulesFile, TellsWhichFileIsWrong) {
    EXPECT_EQ(rulesOf("<array/>").error(), path_ + ": the rules are not a dictionary");
    EXPECT_TRUE(rulesOf("<dict>").error().starts_with(path_ + ": "));
    std::remove(path_.c_str());
    EXPECT_NE(zpctl::rulesFromFile(path_).error().find(path_), std::string::npos);
}

} // namespace
