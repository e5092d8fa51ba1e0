// "remove": unregisters plug-ins by the paths of their bundles.

#include <algorithm>
#include <iterator>
#include <memory>
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

constexpr const char* explanation =
    R"(Each PATH is the folder of a plug-in (NAME.appex), or where it was; a relative one is made
absolute. No file is touched. A plug-in that lies in a watched folder stays away until it is added
again, changes or vanishes. The daemon takes the paths up in this order and ends with the first that
it refuses; those before it stay removed. Needs the entitlement com.tovana.private.zephrin.manager:
a copy of zpctl that "sign" gave it to, not the user root.

Examples:
  zpctl remove /Applications/Cinema.app/PlugIns/Posters.appex

With --json: {"removed": [path...]}.)";

Status remove(const std::vector<std::string>& given, Session& session) {
    std::vector<std::string> paths;
    std::ranges::transform(given, std::back_inserter(paths), absolutePath);
    if (const auto failure = session.daemon().remove(paths))
        return session.fail(*failure);
    return session.report({{"removed", paths}}, [&] {
        session.out() << counted(paths.size(), "plug-in") << " unregistered\n";
    });
}

} // namespace

Action declareRemove(CLI::App& command) {
    const auto paths = std::make_shared<std::vector<std::string>>();
    command.add_option("paths", *paths, "The plug-ins' folders")
        ->type_name("PATH")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [paths](Session& session) { return remove(*paths, session); };
}

} // namespace zpctl
