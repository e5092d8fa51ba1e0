// "find": one plug-in, by its UUID or by the path of its bundle, with what the daemon says of it.

#include <memory>
#include <ostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/value/Uuid.h"
#include "zpctl/Arguments.h"
#include "zpctl/Json.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;

constexpr const char* explanation =
    R"(A path may be relative and lead through symbolic links. A text that is a UUID is never taken as
a path; write ./UUID for a bundle of such a name.

Examples:
  zpctl find 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11
  zpctl find /Applications/Cinema.app/PlugIns/Posters.appex
  zpctl --json find PlugIns/Posters.appex

With --json: the plug-in's form.)";

std::string dateOf(const Dictionary& form) {
    const platform::Value* seconds = form.find("lastmodified");
    const auto number = seconds ? seconds->integerValue() : std::nullopt;
    return number ? dateText({static_cast<double>(*number)}) : std::string();
}

void writeFacts(const Dictionary& form, const Session& session) {
    const PlugIn plugIn = PlugIn::of(form);
    Table table({{"", Tone::faint}, {""}});
    const auto add = [&](const char* title, const std::string& fact) {
        if (!fact.empty())
            table.add({title, fact});
    };
    add("Name", plugIn.name);
    add("Identifier", plugIn.identifier);
    add("Version", plugIn.version);
    add("Extension point", plugIn.extensionPoint);
    add("UUID", plugIn.uuid);
    add("Path", plugIn.path);
    add("Application", plugIn.applicationName.value_or(""));
    add("System volume", plugIn.onSystemVolume ? "yes" : "no");
    add("Registered", dateOf(form));
    add("Election", plugIn.election.empty() ? "none" : plugIn.election);
    table.write(session.out(), session.paint());
}

Status find(const std::string& target, Session& session) {
    const auto uuid = platform::Uuid::parse(target);
    const auto form =
        uuid ? session.daemon().find(*uuid) : session.daemon().findAtPath(absolutePath(target));
    if (!form)
        return session.fail(form.error());
    return session.report(toJson(*form), [&] { writeFacts(*form, session); });
}

} // namespace

Action declareFind(CLI::App& command) {
    const auto target = std::make_shared<std::string>();
    command.add_option("plug-in", *target, "The plug-in's registration UUID, or its bundle's path")
        ->type_name("UUID-or-PATH")
        ->required()
        ->check(complaintAboutEmpty);
    command.footer(explanation);
    return [target](Session& session) { return find(*target, session); };
}

} // namespace zpctl
