#pragma once

#include <optional>
#include <string>

namespace zpctl {

// Removes what has that name in an open folder: a file, a link (never what it leads to), or a
// folder with all below it. It is no failure when there is nothing. On failure the reason.
[[nodiscard]] std::optional<std::string> removeTree(int folder, const std::string& name);

} // namespace zpctl
