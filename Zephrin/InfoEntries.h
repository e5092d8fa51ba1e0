#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Value.h"

// One entry of a dictionary that may be absent itself.
[[nodiscard]] inline std::optional<platform::Value>
entry(const std::optional<platform::Dictionary>& dictionary, std::string_view key) {
    const platform::Value* found = dictionary ? dictionary->find(key) : nullptr;
    return found ? std::optional(*found) : std::nullopt;
}

// The text of it for a log line.
[[nodiscard]] inline std::string shown(const std::optional<platform::Value>& value) {
    return value ? describe(*value) : "(null)";
}
