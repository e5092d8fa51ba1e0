#include "zpd/requests/RulePatterns.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

Array alternatives(std::size_t count) {
    return Array(std::vector<Value>(count, Value("x")));
}

Dictionary keys(std::size_t count) {
    std::vector<platform::DictionaryEntry> rules;
    for (std::size_t i = 0; i < count; ++i)
        rules.push_back({platform::SharedBytes("key" + std::to_string(i)), "x"});
    return Dictionary(std::move(rules));
}

TEST(RulePatterns, CountsEachOneAndEachAlternative) {
    const std::tuple<const char*, Dictionary, bool> cases[] = {
        {"none", {}, false},
        {"keys", keys(mostRulePatterns), false},
        {"one key more", keys(mostRulePatterns + 1), true},
        {"alternatives", {{"k", alternatives(mostRulePatterns)}}, false},
        {"one alternative more", {{"k", alternatives(mostRulePatterns + 1)}}, true},
        {"in two rules", {{"k", alternatives(mostRulePatterns)}, {"l", "x"}}, true},
        {"nested", {{"k", Array{alternatives(mostRulePatterns), "x"}}}, true},
        {"an offer", {{"k", keys(mostRulePatterns + 1)}}, true},
        {"text", {{"k", std::string(mostRuleText, '0')}}, false},
        {"more text", {{"k", Array{std::string(mostRuleText, '0'), "0"}}}, true},
        {"empty ones count too", {{"k", alternatives(mostRulePatterns)}, {"l", Array()}}, true},
    };

    for (const auto& [what, rules, tooMany] : cases)
        EXPECT_EQ(hasTooManyPatterns(rules), tooMany) << what;
}

} // namespace
