#pragma once

#include <cstddef>
#include <expected>
#include <string>
#include <string_view>

#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform::plist {

inline constexpr std::string_view binaryMagic = "bplist00";

// The readers behind `parse`, one for each format.
[[nodiscard]] std::expected<Value, Error> readXml(std::string_view bytes, std::size_t deepest);
[[nodiscard]] std::expected<Value, Error> readBinary(std::string_view bytes, std::size_t deepest);

[[nodiscard]] inline Error corrupt(std::string what) {
    return {&formatErrorDomain, formatErrorCorrupt, std::move(what)};
}

} // namespace platform::plist
