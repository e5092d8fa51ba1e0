#pragma once

#include <string>

namespace CLI {
class App;
}

namespace zpctl {

// Has the command take the UUID of a plug-in as its next argument, which must be one. `uuid` stays
// as long as the command.
void addPlugInArgument(CLI::App& command, std::string& uuid);

// The same for a path, or a name: an empty one would mean the current folder, or nothing.
[[nodiscard]] std::string complaintAboutEmpty(const std::string& text);

// A path as the daemon takes it: canonical, or, when it leads nowhere, at least absolute. Such a
// path goes to the daemon all the same: it is the one to say so.
[[nodiscard]] std::string absolutePath(const std::string& path);

} // namespace zpctl
