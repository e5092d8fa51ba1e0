#include "zpd/requests/RulePatterns.h"

#include <algorithm>

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

std::size_t patternsIn(const Value& pattern) {
    std::size_t count = 0;
    if (const Array* const alternatives = pattern.array()) {
        for (const Value& alternative : *alternatives)
            count += patternsIn(alternative);
    } else if (const Dictionary* const offer = pattern.dictionary()) {
        for (const auto& entry : *offer)
            count += patternsIn(entry.value);
    }
    return std::max<std::size_t>(count, 1);
}

} // namespace

bool hasTooManyPatterns(const Dictionary& rules) {
    std::size_t count = 0;
    for (const auto& rule : rules)
        count += patternsIn(rule.value);
    return count > mostRulePatterns;
}
