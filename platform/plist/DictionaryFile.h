#pragma once

#include <cstddef>
#include <expected>
#include <string>
#include <string_view>

#include "platform/file/OwnershipTest.h"
#include "platform/value/Value.h"

namespace platform {

// Files that hold one dictionary as a property list. Failures are reasons to be logged after the
// file's path. Any thread; no state.

// The dictionary that these bytes are.
[[nodiscard]] std::expected<Dictionary, std::string> parseDictionary(std::string_view bytes);

// The dictionary in a regular file of at most `largest` bytes that nobody but root and this
// process's user could have written. `canonicalPath` is absolute and free of symbolic links.
[[nodiscard]] std::expected<Dictionary, std::string>
readTrustedDictionary(const std::string& canonicalPath, std::size_t largest,
                      OwnershipTest& ownership);

} // namespace platform
