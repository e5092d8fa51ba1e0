#pragma once

#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "platform/value/Value.h"

namespace platform {

// What conforms directly to what. Declarations are a dictionary of type identifier to
// {"ConformsTo": identifier, or array of identifiers}, or an array of such dictionaries with
// "TypeIdentifier" besides; what has another shape is left out. Identifiers compare exactly. Not
// locked, not even for questions: it remembers what it found out.
class TypeGraph {
public:
    TypeGraph() = default;
    TypeGraph(TypeGraph&&) = default;
    TypeGraph& operator=(TypeGraph&&) = default;

    void add(const Value& declarations);

    // True when there is a way from `type` to `target`, of any length; cycles do no harm.
    [[nodiscard]] bool conforms(std::string_view type, std::string_view target);

private:
    static constexpr std::size_t mostRemembered = 65'536;

    using Types = std::unordered_set<std::string_view>; // they lie in parents_

    void addType(std::string_view type, const Value& declaration);
    [[nodiscard]] const Types& reachableFrom(std::string_view type);

    std::map<std::string, std::vector<std::string>, std::less<>> parents_;
    std::unordered_map<std::string_view, Types> reachable_; // of types that were asked for
    std::size_t remembered_ = 0;                            // what the sets hold together
};

} // namespace platform
