#pragma once

#include <string>

namespace zpctl {

// What is wrong with a text that should be a plug-in's UUID, for the option parser; empty for none.
[[nodiscard]] std::string complaintAboutUuid(const std::string& text);

// The same for a path, or a name: an empty one would mean the current folder, or nothing.
[[nodiscard]] std::string complaintAboutEmpty(const std::string& text);

// A path as the daemon takes it: canonical, or, when it leads nowhere, at least absolute. Such a
// path goes to the daemon all the same: it is the one to say so.
[[nodiscard]] std::string absolutePath(const std::string& path);

} // namespace zpctl
