// The rules by which hosts choose plug-ins. A dictionary of rules holds when each of its rules
// does; a rule names a property of the plug-in and a pattern for it:
//
//   true, false    the property is there and not false, or it is not
//   a dictionary   what the host offers, for the property as activation rule
//   a text         one comparison, with an operator in front
//   an array       any of several such texts

#include <algorithm>

#include "Zephrin/ZPDLog.h"
#include "platform/types/Types.h"
#include "platform/value/NumericOrder.h"
#include "zpd/AnnotationKeys.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInInfo.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

constexpr std::string_view entitlementPrefix = "ENTITLEMENT:";
constexpr std::string_view identifierRule = "HXExtensionIdentifier";
constexpr std::string_view uuidRule = "com.tovana.uuid";
constexpr std::string_view electionRule = "HXUserElection";
constexpr std::string_view containingAppRule = "HXExtensionContainingApp";

constexpr char typeOperatorMark = '?';
constexpr std::string_view conformsOperator = "?KM-CONFORMS:";
constexpr std::string_view isOperator = "?KM-IS:";

// Bits 8 to 15 of a stored election say nothing about the choice.
constexpr std::int64_t unusedElectionBits = 0xff00;

using Accepts = bool (*)(std::weak_ordering);

struct Operator {
    std::string_view prefix;
    Accepts accepts;
};

// The first that fits is taken; the last one always does.
constexpr Operator operators[] = {
    {"<>", [](std::weak_ordering o) { return o != 0; }},
    {"<=", [](std::weak_ordering o) { return o <= 0; }},
    {">=", [](std::weak_ordering o) { return o >= 0; }},
    {"=", [](std::weak_ordering o) { return o == 0; }},
    {"<", [](std::weak_ordering o) { return o < 0; }},
    {">", [](std::weak_ordering o) { return o > 0; }},
    {"", [](std::weak_ordering o) { return o == 0; }},
};

bool compares(std::string_view value, std::string_view pattern) {
    const Operator* op = operators;
    while (!pattern.starts_with(op->prefix))
        ++op;
    const std::string_view operand = pattern.substr(op->prefix.size());
    return op->accepts(platform::compareNumerically(value, operand));
}

bool isThere(const Value* value) {
    return value && !value->equalsFalse();
}

} // namespace

bool ZPDPlugIn::match(const std::optional<Dictionary>& rules) const {
    return !rules || match(*rules, currentInfo().get());
}

bool ZPDPlugIn::match(const Dictionary& rules, const ZPDPlugInInfo* info) const {
    return std::all_of(rules.begin(), rules.end(), [&](const platform::DictionaryEntry& rule) {
        return matchKey(rule.key.view(), rule.value, info);
    });
}

bool ZPDPlugIn::matchKey(std::string_view key, const Value& pattern) const {
    return matchKey(key, pattern, currentInfo().get());
}

bool ZPDPlugIn::matchKey(std::string_view key, const Value& pattern,
                         const ZPDPlugInInfo* info) const {
    if (key.starts_with(entitlementPrefix)) {
        const auto value = valueForEntitlement(key.substr(entitlementPrefix.size()));
        return matchPattern(value ? &*value : nullptr, pattern);
    }
    if (key == containingAppRule && !containingPath())
        return false; // even where nothing is asked for
    if (const auto text = textProperty(key)) {
        const Value value(*text);
        return matchPattern(&value, pattern);
    }
    return matchPattern(info ? info->property(key) : nullptr, pattern);
}

bool ZPDPlugIn::matchPattern(const Value* value, const Value& pattern) const {
    if (pattern.equalsTrue())
        return isThere(value);
    if (pattern.equalsFalse())
        return !isThere(value);
    if (!value)
        return false;
    if (pattern.dictionary())
        return matchDictionary(*value, *pattern.dictionary());
    if (value->string())
        return matchValue(*value, pattern);
    const Array* const elements = value->array();
    return elements && std::any_of(elements->begin(), elements->end(),
                                   [&](const Value& v) { return matchValue(v, pattern); });
}

// The properties that are texts, and no entries of the information dictionary.
std::optional<std::string> ZPDPlugIn::textProperty(std::string_view key) const {
    if (key == identifierRule)
        return identifier();
    if (key == uuidRule)
        return uuid().text();
    if (key == electionRule)
        return electionText();
    return key == containingAppRule ? containingPath() : std::nullopt;
}

std::string ZPDPlugIn::electionText() const {
    const auto annotation = context_.annotations.annotationForPlugIn(*this);
    const Value* const stored = annotation ? annotation->find(AnnotationKey::election) : nullptr;
    const std::int64_t election = stored ? stored->integerValue().value_or(0) : 0;
    return std::to_string(election & ~unusedElectionBits);
}

bool ZPDPlugIn::matchValue(const Value& value, const Value& patterns) const {
    const auto text = value.string();
    if (!text)
        return false;
    if (const auto pattern = patterns.string())
        return matchValue(*text, *pattern);
    const Array* const alternatives = patterns.array();
    return alternatives &&
           std::any_of(alternatives->begin(), alternatives->end(), [&](const Value& pattern) {
               return pattern.string() && matchValue(*text, *pattern.string());
           });
}

bool ZPDPlugIn::matchValue(std::string_view value, std::string_view pattern) const {
    if (!pattern.starts_with(typeOperatorMark))
        return compares(value, pattern);
    if (pattern.starts_with(conformsOperator))
        return context_.types.conforms(value, pattern.substr(conformsOperator.size()));
    if (pattern.starts_with(isOperator))
        return context_.types.conforms(pattern.substr(isOperator.size()), value);
    ZPDLogExtension().info("unrecognized match operator:%@", pattern);
    return false;
}

bool ZPDPlugIn::matchDictionary(const Value& value, const Dictionary& pattern) const {
    ZPDLogExtension().debug("evaluating HXExtension filter: %@ value: %@", pattern, value);
    return context_.types.evaluateActivationRule(value, pattern);
}
