#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Value.h"

// The forms of simple values inside a binary property list, all big-endian. Any thread; no state.
namespace platform::plist {

// An unsigned number. REQUIRES: at most 8 bytes
[[nodiscard]] std::uint64_t binaryNumber(std::string_view bytes);

// An integer object: one, two and four bytes are unsigned, eight and sixteen signed. Nothing for
// another size and for what 64 bits do not hold.
[[nodiscard]] std::optional<Value> binaryInteger(std::string_view bytes);

// A float or double. Nothing for another size and for what is not finite.
[[nodiscard]] std::optional<double> binaryReal(std::string_view bytes);

// Nothing for half of a surrogate pair. REQUIRES: an even number of bytes
[[nodiscard]] std::optional<std::string> utf8OfUtf16(std::string_view units);

} // namespace platform::plist
