// "elect": the user's choice about one plug-in.

#include <memory>
#include <ostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/value/Uuid.h"
#include "zpctl/Arguments.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* explanation =
    R"(on is election 1, off is 2, default is 0: no choice. Hosts find the plug-ins that are elected with
HXUserElection=1. The election is on disk when this verb has ended (else the daemon's log says why
not), and stays when the plug-in is installed anew.

Examples:
  zpctl elect 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11 on
  zpctl match HXUserElection=1

With --json: {"uuid", "election"}.)";

struct Arguments {
    std::string uuid;
    std::string choice;
};

struct Choice {
    const char* word;
    int election;
    const char* result;
};

constexpr Choice choices[] = {
    {"on", 1, "is elected"}, {"off", 2, "is not elected"}, {"default", 0, "has no election"}};

const Choice* choiceNamed(const std::string& word) {
    for (const Choice& choice : choices) {
        if (word == choice.word)
            return &choice;
    }
    return nullptr;
}

Status elect(const Arguments& arguments, Session& session) {
    const auto uuid = platform::Uuid::parse(arguments.uuid).value();
    const Choice& choice = *choiceNamed(arguments.choice);
    const platform::Dictionary annotation{{"election", choice.election}};
    if (const auto failure = session.daemon().annotate(uuid, annotation))
        return session.fail(*failure);
    return session.report({{"uuid", uuid.text()}, {"election", choice.election}},
                          [&] { session.out() << uuid.text() << ' ' << choice.result << '\n'; });
}

} // namespace

Action declareElect(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    addPlugInArgument(command, arguments->uuid);
    command.add_option("choice", arguments->choice, "The choice")
        ->type_name("on|off|default")
        ->check([](const std::string& word) {
            return choiceNamed(word) ? std::string() : "neither on, off nor default: " + word;
        })
        ->required();
    command.footer(explanation);
    return [arguments](Session& session) { return elect(*arguments, session); };
}

} // namespace zpctl
