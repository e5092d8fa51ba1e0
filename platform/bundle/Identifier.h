#pragma once

#include <string_view>

namespace platform {

// What may identify a bundle, an application or an extension point. Identifiers become file names
// and appear in logs: 1 to 255 bytes without "/", NUL or control characters (those of U+0080 to
// U+009F included), neither "." nor "..".
[[nodiscard]] bool isIdentifier(std::string_view text);

} // namespace platform
