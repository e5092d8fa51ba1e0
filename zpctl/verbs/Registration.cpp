// "add" and "remove": which plug-ins the daemon knows by the paths of their bundles.

#include <algorithm>
#include <iterator>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Arguments.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* aboutAdding =
    R"(For plug-ins outside the folders that the daemon watches, and for those that "remove" took away.
Each PATH is the folder of a plug-in (NAME.appex); a relative one is made absolute. The daemon takes
them up in this order and ends with the first that it refuses; those before it stay registered. A
plug-in that is registered already stays as it is. What was added outlives the daemon. Hosts find
such a plug-in in an application (NAME.app/PlugIns), or below /System.

Examples:
  zpctl add /opt/themes/Dusk.app/PlugIns/Dusk.appex
  zpctl add PlugIns/*.appex

With --json: {"added": [path...]}.)";

constexpr const char* aboutRemoving =
    R"(Each PATH is the folder of a plug-in (NAME.appex), or where it was; a relative one is made
absolute. No file is touched. A plug-in that lies in a watched folder stays away until it is added
again, changes or vanishes. The daemon takes the paths up in this order and ends with the first that
it refuses; those before it stay removed. Needs the entitlement com.tovana.private.zephrin.manager:
a copy of zpctl that "sign" gave it to, not the user root.

Examples:
  zpctl remove /Applications/Cinema.app/PlugIns/Posters.appex

With --json: {"removed": [path...]}.)";

// What is asked for, and how it is reported.
struct Change {
    std::optional<Failure> (Daemon::*request)(const std::vector<std::string>& paths);
    const char* key;
    const char* done;
};

constexpr Change adding{&Daemon::add, "added", "registered"};
constexpr Change removing{&Daemon::remove, "removed", "unregistered"};

Status carryOut(const Change& change, const std::vector<std::string>& given, Session& session) {
    std::vector<std::string> paths;
    std::ranges::transform(given, std::back_inserter(paths), absolutePath);
    if (const auto failure = (session.daemon().*change.request)(paths))
        return session.fail(*failure);
    return session.report({{change.key, paths}}, [&] {
        session.out() << counted(paths.size(), "plug-in") << ' ' << change.done << '\n';
    });
}

Action declare(CLI::App& command, const Change& change, const char* explanation) {
    const auto paths = std::make_shared<std::vector<std::string>>();
    command.add_option("paths", *paths, "The plug-ins' folders")
        ->type_name("PATH")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [&change, paths](Session& session) { return carryOut(change, *paths, session); };
}

} // namespace

Action declareAdd(CLI::App& command) {
    return declare(command, adding, aboutAdding);
}

Action declareRemove(CLI::App& command) {
    return declare(command, removing, aboutRemoving);
}

} // namespace zpctl
