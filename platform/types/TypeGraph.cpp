#include "platform/types/TypeGraph.h"

#include <set>

namespace platform {

namespace {

const Value* entry(const Value& value, std::string_view key) {
    const Dictionary* dictionary = value.dictionary();
    return dictionary ? dictionary->find(key) : nullptr;
}

} // namespace

void TypeGraph::add(const Value& declarations) {
    if (const Dictionary* byType = declarations.dictionary()) {
        for (const DictionaryEntry& declared : *byType)
            addType(declared.key.view(), declared.value);
        return;
    }
    const Array* list = declarations.array();
    for (std::size_t i = 0; list && i < list->size(); ++i) {
        const Value* type = entry((*list)[i], "TypeIdentifier");
        if (type && type->string())
            addType(*type->string(), (*list)[i]);
    }
}

void TypeGraph::addType(std::string_view type, const Value& declaration) {
    const Value* conformsTo = entry(declaration, "ConformsTo");
    if (!conformsTo)
        return;
    auto& parents = parents_[std::string(type)];
    const auto addParent = [&](const Value& parent) {
        if (const auto name = parent.string())
            parents.emplace_back(*name);
    };
    const Array* several = conformsTo->array();
    if (!several)
        return addParent(*conformsTo);
    for (const Value& parent : *several)
        addParent(parent);
}

bool TypeGraph::conforms(std::string_view type, std::string_view target) const {
    std::set<std::string_view> seen{type};
    std::vector<std::string_view> open{type};
    while (!open.empty()) {
        const std::string_view next = open.back();
        open.pop_back();
        if (next == target)
            return true;
        const auto found = parents_.find(next);
        if (found == parents_.end())
            continue;
        for (const std::string& parent : found->second) {
            if (seen.insert(parent).second)
                open.push_back(parent);
        }
    }
    return false;
}

} // namespace platform
