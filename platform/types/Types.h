#pragma once

#include <string_view>
#include <vector>

#include "platform/value/Value.h"

namespace platform {

// Uniform types and activation rules. Types conform by the declarations in Types.plist and by
// the "TypeDeclarations" of extension points and application bundles. Any thread.
class Types {
public:
    virtual ~Types() = default;

    // The "TypeDeclarations" entries of all that is registered; replaces those of before. Types
    // that bundles have no say in ignore them.
    virtual void setBundleDeclarations(std::vector<Value> /*declarations*/) {}

    // Says that declarations may have changed by now: the next question looks. Until then answers
    // are those of the last look, so that one request may compare with thousands of types.
    virtual void mayHaveChanged() {}

    // True when `type` is `target` or conforms to it, directly or through others.
    [[nodiscard]] virtual bool conforms(std::string_view type, std::string_view target) = 0;

    // Whether an activation rule (a boolean, or a dictionary of type identifier to greatest
    // count) accepts what a host offers (a dictionary of type identifier to count): every
    // offered type must conform to a key and stay within its count; an empty offer is refused.
    [[nodiscard]] virtual bool evaluateActivationRule(const Value& rule,
                                                      const Dictionary& offer) = 0;
};

} // namespace platform
