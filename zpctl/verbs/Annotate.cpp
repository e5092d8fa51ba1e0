// "annotate": what the daemon keeps for one plug-in, out of a file.

#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/value/Uuid.h"
#include "zpctl/Arguments.h"
#include "zpctl/DictionaryFile.h"
#include "zpctl/Json.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;

constexpr const char* explanation =
    R"(FILE.plist (XML or binary) holds one dictionary with the annotation as it is sent:
  election   a number: 1 elected, 2 not elected, 0 no choice
  extension  a dictionary of further settings
One of them, or both; any other key is wrong. What the file leaves out stays as it is; what it holds
takes the place of what was there. The annotation is on disk when this verb has ended, else the
daemon's log says why not.

Examples:
  zpctl annotate 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11 settings.plist
  zpctl --json find 2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11

With --json: {"uuid", "annotation"}.)";

struct Arguments {
    std::string uuid;
    std::string file;
};

// The daemon drops what it does not know without a word, which helps nobody.
std::optional<std::string> complaintAbout(const Dictionary& annotation) {
    for (const auto& [key, value] : annotation) {
        if (key.view() != "election" && key.view() != "extension")
            return "neither \"election\" nor \"extension\": " + std::string(key.view());
    }
    if (annotation.empty())
        return "holds neither \"election\" nor \"extension\"";
    return std::nullopt;
}

Status annotate(const Arguments& arguments, Session& session) {
    const auto uuid = platform::Uuid::parse(arguments.uuid).value();
    const auto annotation = dictionaryFromFile(arguments.file);
    if (!annotation)
        return session.fail({Status::wrongUsage, annotation.error(), {}});
    if (const auto complaint = complaintAbout(*annotation))
        return session.fail({Status::wrongUsage, arguments.file + ": " + *complaint, {}});
    if (const auto failure = session.daemon().annotate(uuid, *annotation))
        return session.fail(*failure);
    const nlohmann::ordered_json json{{"uuid", uuid.text()},
                                      {"annotation", toJson(platform::Value(*annotation))}};
    return session.report(json, [&] { session.out() << uuid.text() << " is annotated\n"; });
}

} // namespace

Action declareAnnotate(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    addPlugInArgument(command, arguments->uuid);
    command.add_option("file", arguments->file, "Property list with the annotation")
        ->type_name("FILE.plist")
        ->required();
    command.footer(explanation);
    return [arguments](Session& session) { return annotate(*arguments, session); };
}

} // namespace zpctl
