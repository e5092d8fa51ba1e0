// "add": registers plug-ins by the paths of their bundles.

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
    R"(For plug-ins outside the folders that the daemon watches, and for those that "remove" took away.
Each PATH is the folder of a plug-in (NAME.appex); a relative one is made absolute. The daemon takes
them up in this order and ends with the first that it refuses; those before it stay registered. A
plug-in that is registered already stays as it is. What was added outlives the daemon. Hosts find
such a plug-in in an application (NAME.app/PlugIns), or below /System.

Examples:
  zpctl add /opt/themes/Dusk.app/PlugIns/Dusk.appex
  zpctl add PlugIns/*.appex

With --json: {"added": [path...]}.)";

Status add(const std::vector<std::string>& given, Session& session) {
    std::vector<std::string> paths;
    std::ranges::transform(given, std::back_inserter(paths), absolutePath);
    if (const auto failure = session.daemon().add(paths))
        return session.fail(*failure);
    return session.report({{"added", paths}}, [&] {
        session.out() << counted(paths.size(), "plug-in") << " registered\n";
    });
}

} // namespace

Action declareAdd(CLI::App& command) {
    const auto paths = std::make_shared<std::vector<std::string>>();
    command.add_option("paths", *paths, "The plug-ins' folders")
        ->type_name("PATH")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [paths](Session& session) { return add(*paths, session); };
}

} // namespace zpctl
