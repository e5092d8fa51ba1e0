#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace platform::plist {

// Takes one character off the front of UTF-8 text. Nothing for malformed text (RFC 3629: overlong
// forms, surrogates and what lies beyond U+10FFFF are malformed). REQUIRES: text is not empty
[[nodiscard]] std::optional<char32_t> takeCharacter(std::string_view& text);

// Whether text is UTF-8 and has no character that XML 1.0 forbids (production 2, Char).
[[nodiscard]] bool isXmlText(std::string_view text);

// REQUIRES: a valid scalar value
void appendCharacter(std::string& out, char32_t character);

} // namespace platform::plist
