#pragma once

#include <optional>
#include <string>

#include "AppRegistry/ARBundleRow.h"

struct ARProxyContext;

// The name under `key` of an entry's info dictionary, in the language in use; nothing when it has
// none. Asked anew each time, so that a change of the language counts at once.
[[nodiscard]] std::optional<std::string> ARLocalizedName(ARProxyContext& context,
                                                         const ARBundleRow& row, const char* key);

[[nodiscard]] std::optional<std::string> ARText(const std::optional<platform::SharedBytes>& text);
