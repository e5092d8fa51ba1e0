// "ready" and "access": plug-ins made ready for this process, and tokens to read their bundles.

#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Arguments.h"
#include "zpctl/Session.h"
#include "zpctl/Table.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* aboutReady =
    R"(Tells whether this client may use the plug-ins and whether they have an executable: they are made
ready for it, once all were found to be allowed. What is in the executable shows when it is started:
scripts cannot be. What was made ready goes with the process, so with zpctl as soon as it ends: "run"
makes ready and starts. To give an environment needs the entitlement
com.tovana.developer.zephrin.provide-environment.

Examples:
  zpctl ready 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11

With --json: {"ready": [uuid...]}.)";

constexpr const char* aboutAccess =
    R"(Writes a token for each plug-in, in their order, with which a program reads the plug-in's bundle
through the daemon, also when it could not open it by itself. A token is good until the daemon ends.

Examples:
  zpctl access 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11

With --json: {"extensions": [{"uuid", "token"}...]}.)";

struct Arguments {
    std::vector<std::string> uuids;
    std::vector<std::string> variables;
};

Status ready(const Arguments& arguments, Session& session) {
    const auto uuids = uuidsOf(arguments.uuids);
    if (const auto failure = session.daemon().ready(uuids, environmentOf(arguments.variables)))
        return session.fail(*failure);
    nlohmann::ordered_json json{{"ready", nlohmann::ordered_json::array()}};
    for (const platform::Uuid& uuid : uuids)
        json["ready"].push_back(uuid.text());
    return session.report(json, [&] {
        for (const platform::Uuid& uuid : uuids)
            session.out() << uuid.text() << " can be launched\n";
    });
}

Status access(const Arguments& arguments, Session& session) {
    const auto uuids = uuidsOf(arguments.uuids);
    const auto tokens = session.daemon().access(uuids);
    if (!tokens)
        return session.fail(tokens.error());
    nlohmann::ordered_json json{{"extensions", nlohmann::ordered_json::array()}};
    Table table({{"UUID", Tone::faint}, {"TOKEN"}});
    for (std::size_t i = 0; i < uuids.size(); ++i) {
        json["extensions"].push_back({{"uuid", uuids[i].text()}, {"token", (*tokens)[i]}});
        table.add({uuids[i].text(), (*tokens)[i]});
    }
    return session.report(json, [&] { table.write(session.out(), session.paint()); });
}

} // namespace

Action declareReady(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    addPlugInArguments(command, arguments->uuids);
    addEnvironmentOption(command, arguments->variables);
    command.footer(aboutReady);
    return [arguments](Session& session) { return ready(*arguments, session); };
}

Action declareAccess(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    addPlugInArguments(command, arguments->uuids);
    command.footer(aboutAccess);
    return [arguments](Session& session) { return access(*arguments, session); };
}

} // namespace zpctl
