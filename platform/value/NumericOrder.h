#pragma once

#include <compare>
#include <string>
#include <string_view>

namespace platform {

// Plain string comparison in which runs of decimal digits compare by their numeric value
// ("1.10" after "1.9"); everything else character by character (bytes of UTF-8, case-sensitive),
// a prefix before the longer text. Runs may have any length; equal values written with other
// leading zeros are the same.
[[nodiscard]] std::weak_ordering compareNumerically(std::string_view a, std::string_view b);

// A text that is equal for two strings exactly when compareNumerically calls them the same: a
// key for indexes and hash tables.
[[nodiscard]] std::string numericEqualityKey(std::string_view text);

} // namespace platform
