// "uninstall": takes an application out of the application folder, in one step. Needs no daemon.

#include <filesystem>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/paths/Places.h"
#include "zpctl/ApplicationFolder.h"
#include "zpctl/Arguments.h"
#include "zpctl/Printable.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* explanation =
    R"(IDENTIFIER is the BQBundleIdentifier of an application in the application folder: /Applications
for root, else that of this user's home, or of ZEPHRIN_HOME. Whoever looks sees all of it, or
nothing. The data containers of its plug-ins and their annotations stay. No daemon is needed.

Examples:
  zpctl uninstall com.example.cinema

With --json: {"identifier", "removed": [path...]}.)";

Status uninstall(const std::string& identifier, const Session& session) {
    const auto failed = [&](const std::string& reason) {
        return session.fail({Status::refused, reason, {}});
    };
    const std::string place = platform::Places::forThisProcess().applicationFolders.front();
    if (!std::filesystem::exists(place)) // nothing to make it for
        return failed("no application " + identifier + " in " + place);
    const auto folder = ApplicationFolder::open(place);
    if (!folder)
        return failed(folder.error());
    std::vector<std::string> removed;
    for (const Application& application : folder->applications()) {
        if (application.identifier != identifier)
            continue;
        const auto outcome = folder->take(application.name);
        if (!outcome)
            return failed(outcome.error());
        if (outcome->leftOver)
            session.note("its files are not removed yet: " + *outcome->leftOver);
        removed.push_back(folder->path() + "/" + application.name);
    }
    if (removed.empty())
        return failed("no application " + identifier + " in " + folder->path());
    return session.report({{"identifier", identifier}, {"removed", removed}}, [&] {
        for (const std::string& path : removed)
            session.out() << printable(identifier + " is no longer at " + path) << '\n';
    });
}

} // namespace

Action declareUninstall(CLI::App& command) {
    const auto identifier = std::make_shared<std::string>();
    command.add_option("identifier", *identifier, "The application's identifier")
        ->type_name("IDENTIFIER")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [identifier](Session& session) { return uninstall(*identifier, session); };
}

} // namespace zpctl
