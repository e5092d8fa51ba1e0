#pragma once

#include <expected>
#include <string>
#include <vector>

namespace zpctl {

// The names of all that lies in an open folder, in order. On failure the errno value.
[[nodiscard]] std::expected<std::vector<std::string>, int> namesIn(int folder);

} // namespace zpctl
