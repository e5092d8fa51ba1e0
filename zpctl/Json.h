#pragma once

#include <string>

#include <nlohmann/json_fwd.hpp>

#include "platform/value/Value.h"

namespace zpctl {

// A value as JSON (RFC 8259): numbers, booleans, strings, arrays and dictionaries as themselves,
// dates as text in UTC ("2026-11-22T22:07:54Z", with milliseconds when there are any), data as
// Base64 text (RFC 4648, section 4), UUIDs as upper-case text, URLs as text.
[[nodiscard]] nlohmann::ordered_json toJson(const platform::Value& value);

// The text of a whole document, indented, ASCII only, with a line feed at its end.
[[nodiscard]] std::string jsonText(const nlohmann::ordered_json& json);

// "2026-11-22T22:07:54Z"; "out of range" when the calendar does not reach that far.
[[nodiscard]] std::string dateText(platform::Date date);

} // namespace zpctl
