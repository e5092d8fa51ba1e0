#include "platform/types/TypeGraph.h"

#include <utility>

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
    reachable_.clear(); // its texts may move
    remembered_ = 0;
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

bool TypeGraph::conforms(std::string_view type, std::string_view target) {
    if (type == target)
        return true;
    const auto declared = parents_.find(type);
    return declared != parents_.end() && reachableFrom(declared->first).contains(target);
}

// The walk is made once for each type: rules may ask for thousands of targets.
const TypeGraph::Types& TypeGraph::reachableFrom(std::string_view type) {
    if (const auto known = reachable_.find(type); known != reachable_.end())
        return known->second;
    if (remembered_ > mostRemembered) {
        reachable_.clear();
        remembered_ = 0;
    }
    Types reached;
    std::vector<std::string_view> open{type};
    while (!open.empty()) {
        const auto found = parents_.find(open.back());
        open.pop_back();
        if (found == parents_.end())
            continue;
        for (const std::string& parent : found->second) {
            if (reached.insert(parent).second)
                open.push_back(parent);
        }
    }
    remembered_ += reached.size() + 1;
    return reachable_.emplace(type, std::move(reached)).first->second;
}

} // namespace platform
