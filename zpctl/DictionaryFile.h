#pragma once

#include <expected>
#include <string>

#include "platform/value/Value.h"

namespace zpctl {

// The dictionary in a property-list file of any format. The other side of the result tells a person
// what is wrong.
[[nodiscard]] std::expected<platform::Dictionary, std::string>
dictionaryFromFile(const std::string& path);

} // namespace zpctl
