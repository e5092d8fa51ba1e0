#pragma once

#include <expected>
#include <string>
#include <string_view>

#include "platform/value/Error.h"

namespace platform {

// Data containers: a private folder (0700, with "tmp" inside) per identifier. Any thread.
class Containers {
public:
    virtual ~Containers() = default;
    // The canonical path of the container, made if missing. `identifier` is a single file name.
    [[nodiscard]] virtual std::expected<std::string, Error>
    dataContainer(std::string_view identifier) = 0;
};

} // namespace platform
