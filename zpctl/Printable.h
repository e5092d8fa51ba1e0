#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace zpctl {

// Text that came from a bundle or a path, made safe to show on a terminal: control characters
// (also the second set), line separators and characters that turn the writing direction are shown
// as \u{HEX}, bytes that are not UTF-8 as \xHH.
[[nodiscard]] std::string printable(std::string_view text);

// How many columns `text` takes on a terminal. REQUIRES: the result of `printable`.
[[nodiscard]] std::size_t columnsOf(std::string_view text);

} // namespace zpctl
