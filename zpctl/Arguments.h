#pragma once

#include <optional>
#include <string>
#include <vector>

#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace CLI {
class App;
}

namespace zpctl {

// Has the command take the UUID of a plug-in as its next argument, which must be one. `uuid` stays
// as long as the command.
void addPlugInArgument(CLI::App& command, std::string& uuid);

// The same for several, at least one.
void addPlugInArguments(CLI::App& command, std::vector<std::string>& uuids);
// What such arguments say. REQUIRES: each is a UUID
[[nodiscard]] std::vector<platform::Uuid> uuidsOf(const std::vector<std::string>& texts);

// Has the command take variables of an environment, as "--env NAME=VALUE", any number of times.
// `variables` stays as long as the command.
void addEnvironmentOption(CLI::App& command, std::vector<std::string>& variables);
// The dictionary of them; nothing when there are none.
[[nodiscard]] std::optional<platform::Dictionary>
environmentOf(const std::vector<std::string>& variables);

// A complaint about a text that is no UUID.
[[nodiscard]] std::string complaintAboutNoUuid(const std::string& text);

// The same for a path, or a name: an empty one would mean the current folder, or nothing.
[[nodiscard]] std::string complaintAboutEmpty(const std::string& text);

// A path as the daemon takes it: canonical, or, when it leads nowhere, at least absolute. Such a
// path goes to the daemon all the same: it is the one to say so.
[[nodiscard]] std::string absolutePath(const std::string& path);

} // namespace zpctl
