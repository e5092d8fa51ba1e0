#include "zpd/requests/RulePatterns.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

struct Load {
    std::size_t patterns = 0;
    std::size_t text = 0;
};

void add(Load& load, const Value& pattern) {
    const std::size_t before = load.patterns;
    if (const Array* const alternatives = pattern.array()) {
        for (const Value& alternative : *alternatives)
            add(load, alternative);
    } else if (const Dictionary* const offer = pattern.dictionary()) {
        for (const auto& entry : *offer)
            add(load, entry.value);
    } else if (const auto text = pattern.string()) {
        load.text += text->size();
    }
    if (load.patterns == before)
        ++load.patterns;
}

} // namespace

bool hasTooManyPatterns(const Dictionary& rules) {
    Load load;
    for (const auto& rule : rules)
        add(load, rule.value);
    return load.patterns > mostRulePatterns || load.text > mostRuleText;
}
