#pragma once

#include <compare>
#include <iterator>
#include <optional>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "platform/value/NumericOrder.h"
#include "platform/value/Value.h"

// The results of `block` for each of `values`, in their order, absent ones left out. `block`
// answers with a std::optional.
template <class Values, class Block>
[[nodiscard]] auto arrayWithValues(const Values& values, Block&& block) {
    using Answer = std::remove_cvref_t<decltype(block(*std::begin(values)))>;
    std::vector<typename Answer::value_type> results;
    for (const auto& value : values) {
        if (Answer result = block(value))
            results.push_back(std::move(*result));
    }
    return results;
}

// A copy of `dictionary` with one key set, or taken away when there is no value. Nothing comes
// of nothing: a first entry starts from an empty dictionary.
[[nodiscard]] std::optional<platform::Dictionary>
dictionaryChanging(const std::optional<platform::Dictionary>& dictionary, std::string_view key,
                   std::optional<platform::Value> value);

// The order of version strings: runs of digits by their numeric value, everything else character
// by character ("1.9" before "1.10", "1" before "1.0").
[[nodiscard]] inline std::weak_ordering compareVersionString(std::string_view version,
                                                             std::string_view other) {
    return platform::compareNumerically(version, other);
}
