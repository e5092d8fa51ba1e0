// "sign": writes the signature file of a bundle or an executable. Needs no daemon.

#include <cstddef>
#include <expected>
#include <memory>
#include <ostream>
#include <string>
#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/file/File.h"
#include "platform/signing/Ed25519.h"
#include "platform/signing/Signer.h"
#include "zpctl/DictionaryFile.h"
#include "zpctl/Json.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Session.h"
#include "zpctl/SigningTarget.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;
using platform::SignedFiles;

constexpr std::size_t largestKeyFile = 64UL << 10;

constexpr const char* explanation =
    R"(The signature covers the executable and Info.plist as they are now: sign last. It is written to
the file Signature in a bundle, or NAME.signature beside a lone executable, in place of an older
one. An executable that a bundle's Info.plist names is signed as part of that bundle. A bundle
without executable can be signed too.

Without --entitlements the signature grants nothing, but shows where the files come from.

A program with entitlements should not be executable by everybody: who may run it can steer it.

Examples:
  zpctl sign --key keys/zephrin.key.pem --entitlements remote.plist Remote.app
  zpctl sign --key keys/zephrin.key.pem /usr/libexec/helper

With --json: {"signature", "bundle", "executable", "key", "entitlements"}.)";

struct Arguments {
    std::string key;
    std::string entitlements;
    std::string target;
};

std::expected<platform::PrivateKey, std::string> readKey(const std::string& path) {
    const auto content = platform::readRegularFile(path, largestKeyFile);
    if (!content)
        return std::unexpected(content.error().description.value_or(path));
    auto key = platform::PrivateKey::fromPem(content->bytes);
    return key ? std::move(key) : std::unexpected(path + ": " + key.error());
}

bool othersMayRead(const std::string& path) {
    struct ::stat status = {};
    return ::stat(path.c_str(), &status) == 0 && (status.st_mode & (S_IRGRP | S_IROTH)) != 0;
}

std::expected<SignedFiles, std::string> filesOf(const std::string& path) {
    const auto target = SigningTarget::at(path);
    if (!target)
        return std::unexpected(target.error());
    if (!target->isFolder)
        return SignedFiles::ofAnyProgram(target->path);
    auto files = SignedFiles::ofBundle(target->path);
    if (!files)
        return std::unexpected(target->path + " is no bundle: it has no Info.plist");
    return *std::move(files);
}

nlohmann::ordered_json textOrNull(const std::optional<std::string>& text) {
    return text ? nlohmann::ordered_json(*text) : nlohmann::ordered_json(nullptr);
}

Status report(const SignedFiles& files, const std::string& key, const Dictionary& entitlements,
              const Session& session) {
    const nlohmann::ordered_json json{{"signature", files.signature()},
                                      {"bundle", textOrNull(files.bundle)},
                                      {"executable", textOrNull(files.executable)},
                                      {"key", key},
                                      {"entitlements", toJson(platform::Value(entitlements))}};
    return session.report(json, [&] {
        Table table({{"", Tone::faint}, {""}});
        table.add({"Bundle", files.bundle.value_or("none")});
        table.add({"Executable", files.executable.value_or("none")});
        table.add({"Signature", files.signature()});
        table.add({"Key", key});
        table.add({"Grants", counted(entitlements.size(), "entitlement")});
        table.write(session.out(), session.paint());
    });
}

Status sign(const Arguments& arguments, const Session& session) {
    const auto key = readKey(arguments.key);
    if (!key)
        return session.fail({Status::wrongUsage, key.error(), {}});
    const auto entitlements =
        arguments.entitlements.empty() ? Dictionary() : dictionaryFromFile(arguments.entitlements);
    if (!entitlements)
        return session.fail({Status::wrongUsage, entitlements.error(), {}});
    const auto files = filesOf(arguments.target);
    if (!files)
        return session.fail({Status::refused, files.error(), {}});
    if (const auto failure = platform::Signer(*key).sign(*files, *entitlements))
        return session.fail({Status::refused, *failure, {}});
    if (othersMayRead(arguments.key))
        session.note(arguments.key + " can be read by others, who can sign with it: chmod 600");
    if (const std::string note = noteOnRunning(*files, *entitlements); !note.empty())
        session.note(note);
    return report(*files, key->publicKey()->identifier(), *entitlements, session);
}

} // namespace

Action declareSign(CLI::App& command) {
    const auto arguments = std::make_shared<Arguments>();
    command.add_option("--key", arguments->key, "The secret key that \"keygen\" made")
        ->type_name("KEY.pem")
        ->required();
    command
        .add_option("--entitlements", arguments->entitlements,
                    "Property list with what the program may do")
        ->type_name("FILE.plist");
    command.add_option("target", arguments->target, "What to sign")
        ->type_name("BUNDLE-or-EXECUTABLE")
        ->required();
    command.footer(explanation);
    return [arguments](Session& session) { return sign(*arguments, session); };
}

} // namespace zpctl
