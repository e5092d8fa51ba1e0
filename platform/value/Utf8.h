#pragma once

#include <string>
#include <string_view>

namespace platform {

// Whether all of `text` is valid UTF-8 (RFC 3629: shortest forms, no surrogates, up to U+10FFFF).
[[nodiscard]] bool isUtf8(std::string_view text) noexcept;
// `text` with U+FFFD in place of every byte that does not belong to a valid character.
[[nodiscard]] std::string repairedUtf8(std::string_view text);

} // namespace platform
