// "install": a copy of an application into the application folder, in one step. Needs no daemon.

#include <filesystem>
#include <memory>
#include <optional>
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
    R"(Copies APP-DIRECTORY (NAME.app, with an Info.plist that has a BQBundleIdentifier) into the
application folder: /Applications for root, else that of this user's home, or of ZEPHRIN_HOME. Over
an application that is there under the same name it is an update: whoever looks sees the old one or
the new one, never half of one, also after a crash or a loss of power. A daemon that runs takes it
up by itself; none is needed.

The copy belongs to who runs this verb, and nobody else can write it; set-id bits are dropped.
Symbolic links stay links. Devices, pipes and sockets are refused. It waits while somebody else
installs or uninstalls.

Examples:
  zpctl install build/Cinema.app
  zpctl verify /Applications/Cinema.app

With --json: {"identifier", "version", "path", "replaced"}, the last one the version that was there
before, or null.)";

// Only `application` may have its name, and its identifier.
std::optional<std::string> conflict(const Application& application,
                                    const std::vector<Application>& installed) {
    for (const Application& other : installed) {
        const bool sameName = other.name == application.name;
        const bool sameIdentifier = other.identifier == application.identifier;
        if (sameIdentifier && !sameName)
            return application.identifier + " is there already as " + other.name +
                   ": give the new folder that name, or uninstall it first (zpctl uninstall " +
                   other.identifier + ")";
        if (sameName && !sameIdentifier)
            return other.name + " is another application there, " + other.identifier +
                   ": give the new folder another name, or uninstall that one first (zpctl "
                   "uninstall " +
                   other.identifier + ")";
    }
    return std::nullopt;
}

std::optional<std::string> complaintAbout(const Application& application,
                                          const ApplicationFolder& folder) {
    if (application.path == folder.path() + "/" + application.name)
        return application.path + " is where it belongs already";
    if (folder.path().starts_with(application.path + "/"))
        return application.path + " holds the application folder";
    if (std::filesystem::exists(std::filesystem::symlink_status(application.path + "/.installing")))
        return application.path + " is not complete: it has the file .installing";
    return conflict(application, folder.applications());
}

std::optional<Application> namedLike(const Application& application,
                                     const std::vector<Application>& installed) {
    for (const Application& other : installed) {
        if (other.name == application.name)
            return other;
    }
    return std::nullopt;
}

Status install(const std::string& source, const Session& session) {
    const auto failed = [&](const std::string& reason) {
        return session.fail({Status::refused, reason, {}});
    };
    const auto application = Application::at(source);
    if (!application)
        return failed(application.error());
    const auto folder =
        ApplicationFolder::open(platform::Places::forThisProcess().applicationFolders.front());
    if (!folder)
        return failed(folder.error());
    if (const auto complaint = complaintAbout(*application, *folder))
        return failed(*complaint);
    const auto before = namedLike(*application, folder->applications());
    const auto outcome = folder->put(*application);
    if (!outcome)
        return failed(outcome.error());
    if (outcome->leftOver)
        session.note("what was there before is not removed yet: " + *outcome->leftOver);
    const std::string path = folder->path() + "/" + application->name;
    const nlohmann::ordered_json json{
        {"identifier", application->identifier},
        {"version", application->version},
        {"path", path},
        {"replaced", before ? nlohmann::ordered_json(before->version) : nullptr}};
    return session.report(json, [&] {
        session.out() << printable(application->title() + " is installed at " + path +
                                   (before ? ", in place of " + before->title() : ""))
                      << '\n';
    });
}

} // namespace

Action declareInstall(CLI::App& command) {
    const auto source = std::make_shared<std::string>();
    command.add_option("application", *source, "The application's folder")
        ->type_name("APP-DIRECTORY")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [source](Session& session) { return install(*source, session); };
}

} // namespace zpctl
