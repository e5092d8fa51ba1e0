// "hold" and "release": plug-ins kept from being used for a while.

#include <cerrno>
#include <memory>
#include <ostream>
#include <poll.h>
#include <string>
#include <system_error>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Arguments.h"
#include "zpctl/ChildProgram.h"
#include "zpctl/EndingSignals.h"
#include "zpctl/Printable.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* aboutHolding =
    R"(zpctl hold [OPTIONS] PATH... [-- COMMAND [ARGUMENT...]]

While the hold lasts nobody is offered these plug-ins, and nobody gets them ready. It lasts while
COMMAND runs, whose exit status becomes zpctl's; without one until zpctl is interrupted or told to
terminate. "release", with the token that is written when the hold is placed, ends it early.

The daemon's end ends the hold too, also when it is started again at once. Without COMMAND zpctl says
so and ends with status 3; else COMMAND goes on, and zpctl says so when it has ended. A zpctl that is
killed (SIGKILL) lets the hold go, and COMMAND goes on.

Each PATH is the folder of a plug-in, or with --app of an application: then all plug-ins in it are
held. Without --terminate, what runs goes on, and what hosts made ready before can still be started. A
hold does not follow a bundle: one that changes meanwhile is a plug-in of its own, and not held.

Examples:
  zpctl hold --app --terminate /Applications/Cinema.app -- zpctl install build/Cinema.app
  zpctl hold --refuse-busy /Applications/Cinema.app/PlugIns/Posters.appex -- ./backup

With --json: {"token", "paths"} when the hold is placed (with COMMAND nothing is written). A refusal
for busy plug-ins has their identifiers: {"error": {"message", "code", "conflicts"}}.)";

constexpr const char* aboutReleasing =
    R"(TOKEN is what "hold" wrote. A token of which there is no hold (any more) is no error.

With --json: {"released": token}.)";

// What a shell says of a command that it cannot run.
constexpr int commandNotFound = 127;
constexpr int commandNotRun = 126;

constexpr int signalBase = 128;

struct Arguments {
    std::vector<std::string> paths;
    bool applications = false;
    bool refuseBusy = false;
    bool terminate = false;

    [[nodiscard]] std::uint64_t flags() const {
        return (applications ? 0 : Daemon::holdPlugIns) |
               (refuseBusy ? Daemon::holdUnlessBusy : 0) | (terminate ? Daemon::holdTerminates : 0);
    }
};

void tell(const platform::Uuid& token, const std::vector<std::string>& paths,
          const Session& session) {
    session.report({{"token", token.text()}, {"paths", paths}}, [&] {
        session.out() << "holding by token " << token.text() << '\n';
        for (const std::string& path : paths)
            session.out() << "  " << printable(path) << '\n';
    });
    session.out().flush();
}

void waitForTheEnd(const EndingSignals& signals, Session& session) {
    // Errors only of the last: nobody reads any more.
    ::pollfd watched[] = {{signals.descriptor(), POLLIN, 0},
                          {session.daemon().ended(), POLLIN, 0},
                          {session.outDescriptor(), 0, 0}};
    while (::poll(watched, std::size(watched), -1) < 0 && errno == EINTR) {}
}

Status runCommand(const EndingSignals& signals, const Session& session) {
    auto program = ChildProgram::start(session.command(), signals);
    if (program)
        return Status(program->wait(signals));
    const int error = program.error();
    return session.fail({Status(error == ENOENT ? commandNotFound : commandNotRun),
                         session.command().front() + ": " + std::generic_category().message(error),
                         {}});
}

constexpr const char* lostText = "the daemon ended, and the hold with it";

// At the end of the hold. What ran while there was none is told; its exit status stays its own.
Status letGo(const platform::Uuid& token, Status status, Session& session) {
    const auto failure = session.daemon().release(token);
    const bool lost = session.daemon().hasEnded();
    if (lost && session.command().empty() && status == Status::done)
        return session.fail({Status::noDaemon, lostText, {}});
    if (lost)
        session.note(lostText);
    else if (failure)
        session.note("cannot release the hold: " + failure->message);
    return status;
}

Status hold(const Arguments& arguments, Session& session) {
    std::vector<std::string> paths;
    for (const std::string& path : arguments.paths)
        paths.push_back(absolutePath(path));
    const EndingSignals signals;
    const auto token = session.daemon().hold(paths, arguments.flags());
    if (!token)
        return session.fail(token.error());
    Status status = Status::done;
    if (const int signal = signals.take(); signal != 0) {
        status = Status(signalBase + signal); // came while the daemon was asked
    } else if (session.command().empty()) {
        tell(*token, paths, session);
        waitForTheEnd(signals, session);
    } else {
        status = runCommand(signals, session);
    }
    return letGo(*token, status, session);
}

Status release(const std::string& token, Session& session) {
    const auto uuid = platform::Uuid::parse(token).value();
    if (const auto failure = session.daemon().release(uuid))
        return session.fail(*failure);
    return session.report({{"released", uuid.text()}}, [&] {
        session.out() << "no hold by token " << uuid.text() << " any more\n";
    });
}

} // namespace

Action declareHold(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    command.add_option("paths", arguments->paths, "What to hold; a COMMAND stands after \"--\"")
        ->type_name("PATH")
        ->required()
        ->check(complaintAboutEmpty);
    command.add_flag("--app", arguments->applications, "The paths are of applications");
    command.add_flag("--refuse-busy", arguments->refuseBusy, "Place no hold on what is running");
    command.add_flag("--terminate", arguments->terminate,
                     "End what is running before the hold counts as placed");
    command.footer(aboutHolding);
    return [arguments](Session& session) { return hold(*arguments, session); };
}

Action declareRelease(CLI::App& command) {
    const auto token = std::make_shared<std::string>();
    command.add_option("token", *token, "The token of the hold")
        ->type_name("TOKEN")
        ->required()
        ->check(complaintAboutNoUuid);
    command.footer(aboutReleasing);
    return [token](Session& session) { return release(*token, session); };
}

} // namespace zpctl
