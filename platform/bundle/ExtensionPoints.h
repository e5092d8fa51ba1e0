#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value/Value.h"

namespace platform {

// An extension point is a file `<identifier>.plist` in one of the ExtensionPoints folders.
inline constexpr std::string_view extensionPointSuffix = ".plist";

// The SDK dictionary of one extension point, read from its file now; nothing where the registry
// would know none. The same rules hold as there: a sound identifier that does not begin with a dot,
// a regular file of at most BundleReader::largestInfo bytes and plist::deepestNesting levels that
// only root and this process's user could have put there (OwnershipTest.h), and of several files
// that pass, the one whose canonical path comes first. A link counts when it leads to a file of the
// same name. Reads files; any thread.
[[nodiscard]] std::optional<Dictionary> readExtensionPoint(const std::vector<std::string>& folders,
                                                           std::string_view identifier);

} // namespace platform
