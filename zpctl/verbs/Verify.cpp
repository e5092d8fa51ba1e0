// "verify": what the signature of a bundle or an executable grants on this box, step by step. Makes
// the same checks as the daemon, and needs none.

#include <memory>
#include <ostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/paths/Places.h"
#include "platform/signing/Verifier.h"
#include "zpctl/Json.h"
#include "zpctl/Printable.h"
#include "zpctl/Session.h"
#include "zpctl/SigningTarget.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;
using platform::SignedFiles;
using platform::Verification;

constexpr const char* explanation =
    R"(Makes the same checks as the daemon of this user (of the system for root, or of ZEPHRIN_HOME),
with the keys in the same trust folder. Shows each check up to the first that fails; exit status 0
when the signature counts, else 1. A program that was running while its files changed has to be
started again before new ones count.

Examples:
  zpctl verify /Applications/Remote.app
  zpctl --json verify /usr/libexec/helper

With --json: {"path", "counts", "reason", "bundle", "executable", "signature", "trustFolder",
"identifier", "key", "entitlements", "notes", "steps": [{"claim", "passed", "detail"}...]}; what is
not known is null.)";

// One answer of this verb. A plain value.
struct Answer {
    std::string path;
    std::string trustFolder;
    SignedFiles files;
    Verification result;

    [[nodiscard]] bool counts() const { return !result.refusal(); }

    [[nodiscard]] Dictionary entitlements() const {
        return result.statement() ? result.statement()->entitlements : Dictionary();
    }

    [[nodiscard]] std::vector<std::string> notes() const;
};

std::vector<std::string> Answer::notes() const {
    std::vector<std::string> notes;
    if (auto note = noteOnRunning(files, entitlements()); !note.empty())
        notes.push_back(std::move(note));
    const bool lone = files.executable && !files.bundle;
    const auto untrusted =
        lone ? SignedFiles::ofAnyProgram(*files.executable).bundle : std::nullopt;
    if (untrusted)
        notes.push_back("the bundle " + *untrusted +
                        " names this executable, but does not count: others could have made it");
    return notes;
}

nlohmann::ordered_json toJson(const Answer& answer) {
    using Json = nlohmann::ordered_json;
    const auto orNull = [](const auto& text) { return text ? Json(*text) : Json(nullptr); };
    const auto& statement = answer.result.statement();
    Json json{{"path", answer.path},
              {"counts", answer.counts()},
              {"reason", orNull(answer.result.refusal())},
              {"bundle", orNull(answer.files.bundle)},
              {"executable", orNull(answer.files.executable)},
              {"signature", answer.files.signature()},
              {"trustFolder", answer.trustFolder},
              {"identifier", statement ? Json(statement->identifier) : Json(nullptr)},
              {"key", answer.result.key().empty() ? Json(nullptr) : Json(answer.result.key())},
              {"entitlements",
               statement ? zpctl::toJson(platform::Value(statement->entitlements)) : Json(nullptr)},
              {"notes", answer.notes()},
              {"steps", Json::array()}};
    for (const auto& [claim, passed, detail] : answer.result.steps())
        json["steps"].push_back({{"claim", claim}, {"passed", passed}, {"detail", detail}});
    return json;
}

void writeFacts(const Answer& answer, const Session& session) {
    Table table({{"", Tone::faint}, {""}});
    table.add({"Bundle", answer.files.bundle.value_or("none")});
    table.add({"Executable", answer.files.executable.value_or("none")});
    table.add({"Signature", answer.files.signature()});
    table.add({"Trust folder", answer.trustFolder});
    if (!answer.result.key().empty())
        table.add({"Key", answer.result.key()});
    if (const auto& statement = answer.result.statement())
        table.add({"Identifier", statement->identifier});
    for (const auto& [name, value] : answer.entitlements())
        table.add({"Entitlement", std::string(name.view()) + " = " + describe(value)});
    table.write(session.out(), session.paint());
}

void writeAnswer(const Answer& answer, const Session& session) {
    writeFacts(answer, session);
    Table steps({{""}, {""}, {"", Tone::faint}});
    for (const auto& [claim, passed, detail] : answer.result.steps())
        steps.add({passed ? "yes" : "NO", claim, detail});
    steps.write(session.out(), session.paint());
    const auto reason = answer.result.refusal();
    const std::string verdict = reason ? "Does not count: " + *reason : "The signature counts.";
    session.out() << session.paint()(Tone::strong, printable(verdict)) << '\n';
    for (const std::string& note : answer.notes())
        session.note(note);
}

Status verify(const std::string& path, const Session& session) {
    const auto target = SigningTarget::at(path);
    if (!target)
        return session.fail({Status::refused, target.error(), {}});
    const std::string trustFolder = platform::Places::forThisProcess().trust;
    platform::Verifier verifier(trustFolder);
    Answer answer{target->path, trustFolder, {}, {}};
    if (target->isFolder) {
        auto files = SignedFiles::ofBundle(target->path);
        if (!files)
            return session.fail({Status::refused, target->path + " is no bundle", {}});
        answer.files = *std::move(files);
        answer.result = verifier.bundle(answer.files);
    } else {
        answer.files = SignedFiles::ofProgram(target->path);
        answer.result = verifier.program(target->path);
    }
    session.report(toJson(answer), [&] { writeAnswer(answer, session); });
    return answer.counts() ? Status::done : Status::refused;
}

} // namespace

Action declareVerify(CLI::App& command) {
    const auto target = std::make_shared<std::string>();
    command.add_option("target", *target, "What to verify")
        ->type_name("FILE-or-BUNDLE")
        ->required();
    command.footer(explanation);
    return [target](Session& session) { return verify(*target, session); };
}

} // namespace zpctl
