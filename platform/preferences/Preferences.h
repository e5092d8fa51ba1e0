#pragma once

#include <optional>
#include <string_view>

#include "platform/value/Value.h"

namespace platform {

// Preference domains: one property list each, read again when it changed. Any thread.
class Preferences {
public:
    virtual ~Preferences() = default;
    // Makes sure that the next `value` sees what is on disk now.
    virtual void synchronize(std::string_view domain) = 0;
    [[nodiscard]] virtual std::optional<Value> value(std::string_view domain,
                                                     std::string_view key) = 0;
};

} // namespace platform
