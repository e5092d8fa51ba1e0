// "match": the plug-ins that the daemon lets this client discover, as a table.

#include <charconv>
#include <cstdint>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/DictionaryFile.h"
#include "zpctl/Json.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Rules.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;

constexpr const char* explanation =
    R"(A rule names a property of the plug-in (an entry of its HXExtensionAttributes, else of its
Info.plist; or HXExtensionIdentifier, HXExtensionContainingApp, HXUserElection, com.tovana.uuid,
ENTITLEMENT:name) and a pattern. All rules must hold. Patterns:
  true, false   the property is there and not false; it is missing or false
  TEXT, =TEXT   equal
  <>TEXT        not equal
  <TEXT <=TEXT >TEXT >=TEXT
                order, with runs of digits compared as numbers (1.10 comes after 1.9)
  ?KM-CONFORMS:TYPE, ?KM-IS:TYPE
                type conformance
The KEY ends at the first "=", so that KEY==true asks for the text "true". A KEY that is given more
than once has alternatives, of which one must hold. Quote rules with < and > for the shell.

A rules file is a property list (XML or binary) that holds one dictionary of KEY to pattern, where a
pattern may also be an array of alternatives or an activation rule. Rules on the command line come
on top of it.

Flags, added up (decimal or 0x...):
  0x1    also older versions of a plug-in
  0x4    with 0x1: also several plug-ins of the same version
  0x8    only plug-ins on the system volume
  0x200  everything (needs an entitlement)

Examples:
  zpctl match
  zpctl match HXExtensionPointIdentifier=com.example.artwork 'HXExtensionVersion=>=1.10'
  zpctl match PictureFormats=svg PictureFormats=png RequestsOpenAccess=false
  zpctl --json match --flags 5 --rules rules.plist

With --json: an array of the plug-ins' forms.)";

struct Arguments {
    std::string flags = "0";
    std::vector<std::string> rules;
    std::string rulesFile;
};

// A decimal or "0x" number of 64 bits. (The option parser would take -1 and cut what is too large.)
std::optional<std::uint64_t> flagsIn(std::string_view text) {
    const int base = text.starts_with("0x") ? 16 : 10;
    text.remove_prefix(base == 16 ? 2 : 0);
    std::uint64_t flags = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), flags, base);
    if (error != std::errc() || end != text.data() + text.size())
        return std::nullopt;
    return flags;
}

std::expected<Dictionary, std::string> rulesOf(const Arguments& arguments) {
    auto given = rulesFromArguments(arguments.rules);
    if (!given || arguments.rulesFile.empty())
        return given;
    auto rules = dictionaryFromFile(arguments.rulesFile);
    if (!rules)
        return rules;
    for (const auto& [key, pattern] : *given)
        rules->set(key, pattern);
    return rules;
}

void writeTable(const std::vector<Dictionary>& forms, const Session& session) {
    Table table({{"IDENTIFIER", Tone::strong},
                 {"VERSION"},
                 {"EXTENSION POINT"},
                 {"ELECTION"},
                 {"UUID", Tone::faint}});
    for (const Dictionary& form : forms) {
        const PlugIn plugIn = PlugIn::of(form);
        table.add({plugIn.identifier, plugIn.version, plugIn.extensionPoint,
                   plugIn.election.empty() ? "-" : plugIn.election, plugIn.uuid});
    }
    if (!table.empty())
        table.write(session.out(), session.paint());
    session.out() << counted(forms.size(), "plug-in") << '\n';
}

nlohmann::ordered_json toJson(const std::vector<Dictionary>& forms) {
    auto json = nlohmann::ordered_json::array();
    for (const Dictionary& form : forms)
        json.push_back(zpctl::toJson(form));
    return json;
}

Status match(const Arguments& arguments, Session& session) {
    const auto rules = rulesOf(arguments);
    if (!rules)
        return session.fail({Status::wrongUsage, rules.error(), {}});
    const auto forms = session.daemon().match(*rules, flagsIn(arguments.flags).value_or(0));
    if (!forms)
        return session.fail(forms.error());
    return session.report(toJson(*forms), [&] { writeTable(*forms, session); });
}

} // namespace

Action declareMatch(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    command.add_option("--flags", arguments->flags, "Discovery flags")
        ->type_name("N")
        ->check([](const std::string& text) {
            return flagsIn(text) ? std::string() : "not a number of 64 bits: " + text;
        });
    command.add_option("--rules", arguments->rulesFile, "Property list of rules")
        ->type_name("FILE.plist");
    command.add_option("rules", arguments->rules, "Rules that the plug-ins must satisfy")
        ->type_name("KEY=PATTERN");
    command.footer(explanation);
    return [arguments](Session& session) { return match(*arguments, session); };
}

} // namespace zpctl
