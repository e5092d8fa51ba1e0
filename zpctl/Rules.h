#pragma once

#include <expected>
#include <span>
#include <string>

#include "platform/value/Value.h"

namespace zpctl {

// Matching rules from the command line. Each text is KEY=PATTERN, split at the first "="; the
// patterns true and false are the booleans, anything else stays a string, operator and all. A key
// that comes again makes an array of alternatives. The other side of the result tells a person
// what is wrong.
[[nodiscard]] std::expected<platform::Dictionary, std::string>
rulesFromArguments(std::span<const std::string> arguments);

} // namespace zpctl
