#pragma once

#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value/Value.h"

namespace platform {

// What conforms directly to what. Declarations are a dictionary of type identifier to
// {"ConformsTo": identifier, or array of identifiers}, or an array of such dictionaries with
// "TypeIdentifier" besides; what has another shape is left out. Identifiers compare exactly. Not
// locked.
class TypeGraph {
public:
    void add(const Value& declarations);

    // True when there is a way from `type` to `target`, of any length; cycles do no harm.
    [[nodiscard]] bool conforms(std::string_view type, std::string_view target) const;

private:
    void addType(std::string_view type, const Value& declaration);

    std::map<std::string, std::vector<std::string>, std::less<>> parents_;
};

} // namespace platform
