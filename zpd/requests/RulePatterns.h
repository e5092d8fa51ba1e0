#pragma once

#include <cstddef>

#include "platform/value/Value.h"

// The most patterns that the rules of one request may hold: each is compared with each candidate.
inline constexpr std::size_t mostRulePatterns = 4096;

// The most bytes of text that they may be of together: a long one is read for each candidate too.
inline constexpr std::size_t mostRuleText = 64 * mostRulePatterns;

// Counts every pattern: of an array each alternative, of a dictionary each entry.
[[nodiscard]] bool hasTooManyPatterns(const platform::Dictionary& rules);
