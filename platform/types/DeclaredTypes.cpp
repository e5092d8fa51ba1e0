#include "platform/types/DeclaredTypes.h"

#include <algorithm>

namespace platform {

void DeclaredTypes::setBundleDeclarations(std::vector<Value> declarations) {
    const std::lock_guard lock(mutex_);
    bundleDeclarations_ = std::move(declarations);
    rebuild();
}

void DeclaredTypes::refresh() {
    if (lookDue_.exchange(false) && file_.refresh())
        rebuild();
}

void DeclaredTypes::rebuild() {
    graph_ = TypeGraph();
    const Dictionary& file = file_.dictionary();
    const Value* inner = file.find("TypeDeclarations");
    graph_.add(inner ? *inner : Value(file));
    for (const Value& declarations : bundleDeclarations_)
        graph_.add(declarations);
}

bool DeclaredTypes::conforms(std::string_view type, std::string_view target) {
    const std::lock_guard lock(mutex_);
    refresh();
    return graph_.conforms(type, target);
}

// True when a key that the type conforms to allows as many of it.
bool DeclaredTypes::accepts(const Dictionary& rule, const DictionaryEntry& offered) {
    const auto count = offered.value.integerValue();
    if (!count || *count < 0)
        return false;
    return std::ranges::any_of(rule, [&](const DictionaryEntry& allowed) {
        const auto most = allowed.value.integerValue();
        return most && *count <= *most && graph_.conforms(offered.key.view(), allowed.key.view());
    });
}

bool DeclaredTypes::evaluateActivationRule(const Value& rule, const Dictionary& offer) {
    const auto isCount = [](const DictionaryEntry& entry) { return entry.value.isNumber(); };
    if (offer.empty() || !std::ranges::all_of(offer, isCount))
        return false;
    if (rule.isNumber())
        return *rule.booleanValue();
    if (!rule.dictionary())
        return false;
    const std::lock_guard lock(mutex_);
    refresh();
    return std::ranges::all_of(offer, [&](const DictionaryEntry& offered) {
        return accepts(*rule.dictionary(), offered);
    });
}

} // namespace platform
