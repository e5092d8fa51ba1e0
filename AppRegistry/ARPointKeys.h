#pragma once

#include <optional>
#include <vector>

#include "platform/value/SharedBytes.h"
#include "platform/value/Value.h"

// The keys of the extension point index. The index only narrows down: it never drops a plug-in
// that the matching rule on "HXExtensionPointIdentifier" would accept. Two texts have the same key
// exactly when the rules' numeric ordering calls them the same. Pure functions.

// The keys under which a plug-in stands: of its attribute "HXExtensionPointIdentifier", or else of
// its info dictionary's entry, a text or an array with texts. `info` has the entry at its top.
[[nodiscard]] std::vector<platform::SharedBytes> ARPointKeysOf(const platform::Dictionary& info);

// The keys that a pattern can match; nothing when it may match plug-ins that have none of a few
// keys (booleans, dictionaries, other operators than equality).
[[nodiscard]] std::optional<std::vector<platform::SharedBytes>>
ARPointKeysOfPattern(const platform::Value& pattern);
