#pragma once

#include <cstddef>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// Property lists: XML (version 1.0 of the PropertyList DTD) and binary ("bplist00") are read,
// XML is written. A list holds strings, numbers, booleans, dates, data, arrays and dictionaries
// with text keys. Integers >= 0 become unsigned values. Reading is bounded in nesting and never
// expands XML entities other than the five predefined ones and character references; a declared
// entity is an error. Any thread; no state.
namespace plist {

inline constexpr std::size_t deepestNesting = 32;

// A list takes at most so many bytes for one of the wire's encoding (besides its frame): arrays
// within arrays do, or an exact date very near to 1970.
inline constexpr std::size_t mostXmlPerByte = 40;

[[nodiscard]] std::expected<Value, Error> parse(std::string_view bytes,
                                                std::size_t deepest = deepestNesting);

// What keeps a value from being written: a kind that a property list cannot hold (null, UUID, URL,
// encoded records), a non-finite number or date, text with characters that XML 1.0 forbids, at any
// depth. Nothing when there is nothing.
[[nodiscard]] std::optional<Error> objectionToXml(const Value& value);

// Fails when there is an objection. What is written reads back equal; dates may carry a fraction
// of a second, which other readers may refuse.
[[nodiscard]] std::expected<std::string, Error> writeXml(const Value& value);

} // namespace plist

} // namespace platform
