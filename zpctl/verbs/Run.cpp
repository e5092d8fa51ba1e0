// "run": a plug-in made ready, started, and talked to over standard input and output.

#include <csignal>
#include <memory>
#include <ostream>
#include <string>
#include <system_error>
#include <unistd.h>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Arguments.h"
#include "zpctl/EndingSignals.h"
#include "zpctl/Relay.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* explanation =
    R"(Makes the plug-in ready, starts it in its sandbox as this process's own, and connects standard
input and output to its socket. The end of the input half-closes the socket. Ends with status 0 when
the plug-in has hung up, and all that it said is written or nobody reads it any more; with 1 when it
cannot be written; interrupted with 128 and the number of the signal, which ends the plug-in too.

A host does not learn how its plug-in ended, so neither does this: also one that crashes, or ends at
once as a library is missing, is status 0. The daemon's log tells ("process ... is gone").

To give an environment needs the entitlement com.tovana.developer.zephrin.provide-environment.

Examples:
  echo co | zpctl run 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11
  zpctl run 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11 --env TZ=UTC

What is written is the plug-in's own, also with --json.)";

constexpr int signalBase = 128; // of exit statuses

struct Arguments {
    std::string uuid;
    std::vector<std::string> variables;
};

Status talk(const platform::UniqueFd& socket, const EndingSignals& signals,
            const Session& session) {
    Relay relay({STDIN_FILENO, STDOUT_FILENO, socket.get(), signals.descriptor()});
    switch (relay.run()) {
    case Relay::End::interrupted:
        return Status(signalBase + signals.take());
    case Relay::End::unwritable:
        return session.fail(
            {Status::refused,
             "standard output: " + std::generic_category().message(relay.writeError()),
             {}});
    case Relay::End::hungUp:
    case Relay::End::unread:
        break;
    }
    return Status::done;
}

Status run(const Arguments& arguments, Session& session) {
    const auto uuid = platform::Uuid::parse(arguments.uuid).value();
    const EndingSignals signals;
    std::signal(SIGPIPE, SIG_IGN); // a reader that is gone is no failure, however that is found out
    const auto environment = environmentOf(arguments.variables);
    if (const auto failure = session.daemon().ready({uuid}, environment))
        return session.fail(*failure);
    const auto socket = session.jobs().start(uuid);
    if (!socket)
        return session.fail(socket.error());
    return talk(*socket, signals, session);
}

} // namespace

Action declareRun(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    addPlugInArgument(command, arguments->uuid);
    addEnvironmentOption(command, arguments->variables);
    command.footer(explanation);
    return [arguments](Session& session) { return run(*arguments, session); };
}

} // namespace zpctl
