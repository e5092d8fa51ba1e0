#pragma once

#include <optional>
#include <string>
#include <string_view>

// Between file paths and the text of file URLs (RFC 8089). Files are known by their paths
// everywhere; URLs are only text that comes in and goes out.

// The path that a file URL names, percent-decoded, without trailing slashes. Nothing for a text
// without scheme, another scheme, a host other than none or "localhost", a path that is not
// absolute, a malformed escape, or a decoded NUL.
[[nodiscard]] std::optional<std::string> pathFromFileURL(std::string_view url);

// "file://" and the percent-encoded path.
[[nodiscard]] std::string fileURLFromPath(std::string_view path);
