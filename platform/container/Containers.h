#pragma once

#include <expected>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <utility>
#include <vector>

#include "platform/value/Error.h"

namespace platform {

// Data containers: a private folder (0700, with "tmp" inside) per identifier. Any thread.
class Containers {
public:
    virtual ~Containers() = default;
    // The canonical path of the container, made if missing. `identifier` is a single file name.
    // It is made to belong to the user and group of that number, where one is given.
    [[nodiscard]] virtual std::expected<std::string, Error>
    dataContainer(std::string_view identifier, std::optional<uid_t> owner) = 0;
    // To whom the containers belong that there are, by identifier.
    [[nodiscard]] virtual std::vector<std::pair<std::string, uid_t>> owners() = 0;
};

} // namespace platform
