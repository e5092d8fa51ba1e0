// "consent": what the user agreed to, for each application. Needs no daemon.

#include "platform/consent/Consent.h"

#include <algorithm>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/consent/ConsentFile.h"
#include "platform/file/File.h"
#include "platform/paths/Places.h"
#include "zpctl/Printable.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::ConsentFile;
using Json = nlohmann::ordered_json;

constexpr const char* explanation =
    R"(IDENTIFIER is the BQBundleIdentifier of an application, SERVICE what it was asked for. grant and
revoke write down what the user said; list shows it, for one application or for all. The daemon
looks at it whenever a plug-in of the application is made ready: what runs already goes on as it
is. No daemon is needed.

kConsentServiceKeyboardNetwork lets a keyboard that has RequestsOpenAccess use the network. It is the
only service; another name is written down all the same, with a note on standard error.

Examples:
  zpctl consent grant com.example.keys kConsentServiceKeyboardNetwork
  zpctl consent list

With --json: {"identifier", "service", "granted"}; of list an array of such.)";

constexpr const char* grantWord = "grant";
constexpr const char* revokeWord = "revoke";
constexpr const char* listWord = "list";

struct Arguments {
    std::string act;
    std::string identifier;
    std::string service;
};

std::string complaintAboutAct(const std::string& act) {
    const bool known = act == grantWord || act == revokeWord || act == listWord;
    return known ? std::string() : "neither grant, revoke nor list: " + act;
}

// Both kinds of names: an identifier that is no name of a file is none of a bundle.
std::string complaintAboutName(const std::string& name) {
    return platform::isPlainName(name) ? std::string() : "no such name: " + name;
}

Json asJson(const ConsentFile::Record& record) {
    return {{"identifier", record.application},
            {"service", record.service},
            {"granted", record.granted}};
}

const char* wordFor(const ConsentFile::Record& record) {
    return record.granted ? "granted" : "not granted";
}

Status set(const ConsentFile& file, const ConsentFile::Record& record, const Session& session) {
    if (const auto failure = file.record(record))
        return session.fail({Status::refused, *failure, {}});
    if (record.service != platform::kConsentServiceKeyboardNetwork)
        session.note("nothing asks for a service of this name: " + record.service);
    return session.report(asJson(record), [&] {
        session.out() << printable(record.service + " is " + wordFor(record) + " to " +
                                   record.application)
                      << '\n';
    });
}

// Of all applications without an identifier.
Status list(const ConsentFile& file, const std::string& identifier, const Session& session) {
    auto records = file.records();
    if (!records)
        return session.fail({Status::refused, records.error(), {}});
    std::erase_if(*records, [&](const ConsentFile::Record& record) {
        return !identifier.empty() && record.application != identifier;
    });
    Json json = Json::array();
    Table table({{"APPLICATION", Tone::strong}, {"SERVICE"}, {"CONSENT"}});
    for (const ConsentFile::Record& record : *records) {
        json.push_back(asJson(record));
        table.add({record.application, record.service, wordFor(record)});
    }
    return session.report(json, [&] { table.write(session.out(), session.paint()); });
}

Status consent(const Arguments& arguments, const Session& session) {
    const ConsentFile file(platform::Places::forThisProcess().consent);
    const bool isList = arguments.act == listWord;
    if (isList == !arguments.service.empty()) {
        const char* const complaint =
            isList ? "list takes no service" : "an identifier and a service are required";
        return session.fail({Status::wrongUsage, complaint, {}});
    }
    if (isList)
        return list(file, arguments.identifier, session);
    return set(file, {arguments.identifier, arguments.service, arguments.act == grantWord},
               session);
}

} // namespace

Action declareConsent(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    command.add_option("act", arguments->act, "What to do")
        ->type_name("grant|revoke|list")
        ->check(complaintAboutAct)
        ->required();
    command.add_option("identifier", arguments->identifier, "The application's identifier")
        ->type_name("IDENTIFIER")
        ->check(complaintAboutName);
    command.add_option("service", arguments->service, "What it was asked for")
        ->type_name("SERVICE")
        ->check(complaintAboutName);
    command.footer(explanation);
    return [arguments](Session& session) { return consent(*arguments, session); };
}

} // namespace zpctl
