#include "AppRegistry/ARPointKeys.h"

#include <algorithm>
#include <string_view>

#include "platform/bundle/InfoKeys.h"
#include "platform/value/NumericOrder.h"

using platform::SharedBytes;
using platform::Value;

namespace {

void addKey(std::vector<SharedBytes>& keys, std::string_view text) {
    SharedBytes key(platform::numericEqualityKey(text));
    if (std::ranges::find(keys, key) == keys.end())
        keys.push_back(std::move(key));
}

// What a text pattern without operator, or with "=", compares with; nothing for other operators.
std::optional<std::string_view> operandOfEquality(std::string_view pattern) {
    if (pattern.starts_with('=')) // "==", "=<" and the like compare with what follows the first
        return pattern.substr(1);
    if (pattern.starts_with('<') || pattern.starts_with('>') || pattern.starts_with('?'))
        return std::nullopt;
    return pattern;
}

const Value* ruleValueOf(const platform::Dictionary& info) {
    const auto* declaration = info.findDictionary(platform::InfoKey::extension);
    const auto* attributes =
        declaration ? declaration->findDictionary(platform::InfoKey::attributes) : nullptr;
    if (attributes) {
        if (const Value* found = attributes->find(platform::InfoKey::extensionPoint))
            return found;
    }
    return info.find(platform::InfoKey::extensionPoint);
}

} // namespace

std::vector<SharedBytes> ARPointKeysOf(const platform::Dictionary& info) {
    std::vector<SharedBytes> keys;
    const Value* value = ruleValueOf(info);
    if (!value)
        return keys;
    if (const auto text = value->string())
        addKey(keys, *text);
    if (const platform::Array* list = value->array()) {
        for (const Value& item : *list) {
            if (const auto text = item.string())
                addKey(keys, *text);
        }
    }
    return keys;
}

std::optional<std::vector<SharedBytes>> ARPointKeysOfPattern(const Value& pattern) {
    std::vector<SharedBytes> keys;
    const platform::Array single{pattern};
    const platform::Array* alternatives = pattern.array();
    if (!alternatives && !pattern.string())
        return std::nullopt;
    for (const Value& alternative : alternatives ? *alternatives : single) {
        const auto text = alternative.string();
        if (!text)
            continue; // never matches
        const auto operand = operandOfEquality(*text);
        if (!operand)
            return std::nullopt;
        addKey(keys, *operand);
    }
    return keys;
}
