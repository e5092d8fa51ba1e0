#include "zpctl/CommandLine.h"

#include <algorithm>
#include <ostream>

#include <CLI/CLI.hpp>

#include "zpctl/Printable.h"

namespace zpctl {

namespace {

constexpr double longestTimeout = 86400;

constexpr const char* closingText =
    R"(Plain output is for people and may change; it is coloured only on a terminal, and not when
NO_COLOR is set. Characters that could disturb a terminal are shown as \u{HEX}.

--json output is for programs and stays as it is: dictionaries and arrays as JSON has them, dates
as text in UTC ("2026-11-22T22:07:54Z"), data as Base64 text, UUIDs in upper case, characters that
are not ASCII as \uXXXX. With it an error is {"error": {"message": ..., "code": ...}}; wrong usage and
notes are told in words all the same.

Exit status:
  0  done
  1  the daemon refused; its message and code are on standard error. Of a verb that needs no
     daemon: not done; of verify: no signature that counts
  2  wrong usage
  3  no daemon, or none that answered in time

Environment:
  ZEPHRIN_HOME  the daemon's home, when it is not the usual one
  ZEPHRIN_LOG   debug|info|default|error: also log what the client library does

Examples:
  zpctl tree
  zpctl match HXExtensionPointIdentifier=com.example.artwork
  zpctl match 'HXExtensionVersion=>=1.10'
  zpctl --json find /Applications/Cinema.app/PlugIns/Posters.appex
  zpctl elect 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11 on
  zpctl install build/Cinema.app
  zpctl verify /Applications/Cinema.app
  zpctl VERB --help)";

std::string whatIsWrong(const CLI::App& app, const CLI::Error& error) {
    const std::vector<std::string> unknown = app.remaining();
    if (!unknown.empty())
        return "unknown verb or option: " + unknown.front();
    if (error.get_name() == "RequiredError" && app.get_subcommands().empty())
        return "a verb is required";
    return error.what();
}

std::string failureText(const CLI::App* app, const CLI::Error& error) {
    const auto verbs = app->get_subcommands();
    const std::string verb = verbs.empty() ? "" : " " + verbs.front()->get_name();
    return "zpctl: " + printable(whatIsWrong(*app, error)) + "\nzpctl" + verb +
           " --help tells how it is used.\n";
}

// Where the verb stands among the arguments, after the options before it.
std::size_t verbIn(const std::vector<std::string>& arguments) {
    std::size_t at = 0;
    while (at < arguments.size() && arguments[at].starts_with('-')) {
        const bool hasValue = arguments[at] == "--service" || arguments[at] == "--timeout";
        at += hasValue ? 2 : 1;
    }
    return at;
}

// Takes the command off that stands after the first "--" of a verb that is to run one. Throws
// CLI::ParseError when there is none: a script's variable was empty.
std::vector<std::string> takeCommand(std::vector<std::string>& arguments) {
    const std::size_t at = verbIn(arguments);
    const auto takes = [&](const Verb& verb) {
        return verb.takesCommand && at < arguments.size() && verb.name == arguments[at];
    };
    const auto mark = std::ranges::find(arguments, "--");
    if (std::ranges::none_of(verbs(), takes) || mark == arguments.end())
        return {};
    std::vector<std::string> command(mark + 1, arguments.end());
    if (command.empty())
        throw CLI::ValidationError(arguments[at], "no COMMAND after \"--\"");
    arguments.erase(mark, arguments.end());
    return command;
}

// A parsed command line: what to run, and with which options.
class CommandLine {
public:
    CommandLine() : app_("Talks to zpd, the daemon that knows the plug-ins of this box.", "zpctl") {
        app_.add_option("--service", options_.service, "The daemon's service name")
            ->type_name("NAME")
            ->check([](const std::string& name) {
                const bool bad = name.empty() || name.find('/') != std::string::npos;
                return bad ? "a service name is not empty and has no \"/\"" : std::string();
            });
        app_.add_flag("--json", options_.json, "Write JSON");
        app_.add_option("--timeout", options_.timeout,
                        "Give up when the daemon has not answered for so long (10)")
            ->type_name("SECONDS")
            ->check(CLI::Range(0.001, longestTimeout).description(""));
        app_.set_version_flag("--version", "zpctl " ZPCTL_VERSION);
        app_.footer(closingText);
        app_.failure_message(failureText);
        app_.get_formatter()->label("SUBCOMMAND", "VERB");
        app_.require_subcommand(1);
        for (const Verb& verb : verbs())
            add(verb);
    }

    // Throws CLI::ParseError, as help and version do too.
    void parse(std::vector<std::string> arguments) {
        options_.command = takeCommand(arguments);
        std::ranges::reverse(arguments); // as the library takes them
        app_.parse(std::move(arguments));
    }

    // What the user reads of a parse that did not end in an action.
    [[nodiscard]] Status explain(const CLI::ParseError& error, const Terminal& terminal) const {
        const int status = app_.exit(error, terminal.out, terminal.err);
        return status == 0 ? Status::done : Status::wrongUsage;
    }

    [[nodiscard]] const Options& options() const { return options_; }

    [[nodiscard]] const Action& action() const { return action_; }

private:
    void add(const Verb& verb) {
        CLI::App* command = app_.add_subcommand(verb.name, verb.summary)->group("Verbs");
        command->callback([this, action = verb.declare(*command)] { action_ = action; });
    }

    CLI::App app_;
    Options options_;
    Action action_;
};

} // namespace

Status run(const std::vector<std::string>& arguments, const Terminal& terminal) {
    CommandLine commandLine;
    try {
        commandLine.parse(arguments);
    } catch (const CLI::ParseError& error) {
        return commandLine.explain(error, terminal);
    }
    Session session(commandLine.options(), terminal);
    return commandLine.action()(session);
}

} // namespace zpctl
