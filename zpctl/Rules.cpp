#include "zpctl/Rules.h"

#include <cstddef>
#include <map>
#include <string_view>
#include <vector>

namespace zpctl {

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

using Alternatives = std::vector<std::string>;
using Grouped = std::map<std::string, Alternatives, std::less<>>;

bool isBooleanText(std::string_view pattern) {
    return pattern == "true" || pattern == "false";
}

Value patternOf(const std::string& text) {
    return isBooleanText(text) ? Value(text == "true") : Value(text);
}

std::expected<Grouped, std::string> groupedByKey(std::span<const std::string> arguments) {
    Grouped grouped;
    for (const std::string& argument : arguments) {
        const std::size_t split = argument.find('=');
        if (split == 0 || split == std::string::npos)
            return std::unexpected("not a rule (KEY=PATTERN): " + argument);
        grouped[argument.substr(0, split)].push_back(argument.substr(split + 1));
    }
    return grouped;
}

// The daemon compares alternatives as strings, so that a boolean among them would never hold.
std::expected<Value, std::string> patternOf(const std::string& key,
                                            const Alternatives& alternatives) {
    if (alternatives.size() == 1)
        return patternOf(alternatives.front());
    std::vector<Value> patterns;
    patterns.reserve(alternatives.size());
    for (const std::string& text : alternatives) {
        if (isBooleanText(text))
            return std::unexpected("true and false have no alternatives: " + key);
        patterns.emplace_back(text);
    }
    return Value(Array(std::move(patterns)));
}

} // namespace

std::expected<Dictionary, std::string> rulesFromArguments(std::span<const std::string> arguments) {
    const auto grouped = groupedByKey(arguments);
    if (!grouped)
        return std::unexpected(grouped.error());
    Dictionary rules;
    for (const auto& [key, alternatives] : *grouped) {
        auto pattern = patternOf(key, alternatives);
        if (!pattern)
            return std::unexpected(pattern.error());
        rules.set(key, std::move(*pattern));
    }
    return rules;
}

} // namespace zpctl
