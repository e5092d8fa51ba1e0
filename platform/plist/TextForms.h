#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Value.h"

// The text forms of values inside XML elements. Readers answer nothing for text that is not of
// the form; white space around it is ignored. Any thread; no state.
namespace platform::plist {

// Decimal, or hexadecimal after "0x", with an optional sign; from -2^63 to 2^64-1.
[[nodiscard]] std::optional<Value> readInteger(std::string_view text);
// A finite decimal number.
[[nodiscard]] std::optional<Value> readReal(std::string_view text);
// "2026-11-22T22:05:00Z", or with a fraction of a second: "2026-11-22T22:05:00.25Z".
[[nodiscard]] std::optional<Value> readDate(std::string_view text);
// Base 64 (RFC 4648, section 4) with white space anywhere.
[[nodiscard]] std::optional<Value> readData(std::string_view text);

// False for a date outside the years 0 to 9999.
[[nodiscard]] bool hasDateText(Date date);
// The shortest text that reads back as the same date. REQUIRES: it has one
[[nodiscard]] std::string dateText(Date date);
[[nodiscard]] std::string dataText(const Data& data);
// The shortest text that reads back as the same number. REQUIRES: finite
[[nodiscard]] std::string realText(double number);

[[nodiscard]] bool isXmlSpace(char c);

} // namespace platform::plist
