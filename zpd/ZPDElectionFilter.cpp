#include "zpd/ZPDElectionFilter.h"

#include <algorithm>

#include "zpd/AnnotationKeys.h"
#include "zpd/Entitlements.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

constexpr std::string_view electionRule = "HXUserElection";
constexpr char equalsOperator = '=';

bool isLetterOrDigit(char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

// A pattern that asks for equality, without its operator.
std::optional<std::string> normalized(const Value& pattern) {
    const auto text = pattern.string();
    if (!text || text->empty())
        return std::nullopt;
    if (text->front() == equalsOperator)
        return std::string(text->substr(1));
    return isLetterOrDigit(text->front()) ? std::optional<std::string>(*text) : std::nullopt;
}

const Value* entry(const std::optional<Dictionary>& dictionary, std::string_view key) {
    return dictionary ? dictionary->find(key) : nullptr;
}

} // namespace

std::optional<ZPDElectionFilter> ZPDElectionFilter::of(const Dictionary& query) {
    const Value* const asked = query.find(electionRule);
    if (!asked || (!asked->array() && !asked->string()))
        return std::nullopt;
    ZPDElectionFilter filter;
    for (const Value& pattern : asked->array() ? *asked->array() : Array{*asked}) {
        auto text = normalized(pattern);
        if (!text)
            return std::nullopt;
        filter.patterns_.push_back(std::move(*text));
    }
    return filter;
}

bool ZPDElectionFilter::accepts(std::int64_t election) const {
    const std::string text = std::to_string(static_cast<std::uint8_t>(election));
    return std::ranges::find(patterns_, text) != patterns_.end();
}

std::string ZPDElectionFilter::annotationKey(std::string_view identifier,
                                             const std::optional<Dictionary>& entitlements) {
    const Value* const replaced = entry(entitlements, Entitlement::replacePlugIn);
    return std::string(replaced && replaced->string() ? *replaced->string() : identifier);
}

std::int64_t ZPDElectionFilter::election(const std::optional<Dictionary>& annotation,
                                         const std::optional<Dictionary>& entitlements) {
    if (const Value* const stored = entry(annotation, AnnotationKey::election))
        return stored->integerValue().value_or(0);
    const Value* const automatic = entry(entitlements, Entitlement::autoElect);
    return automatic && automatic->booleanValue().value_or(false) ? 1 : 0;
}
