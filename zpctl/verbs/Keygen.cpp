// "keygen": a new key pair in files. Needs no daemon.

#include <cerrno>
#include <fcntl.h>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <system_error>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "platform/file/File.h"
#include "platform/signing/Ed25519.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

constexpr const char* explanation =
    R"(Writes zephrin.key.pem, the secret key that "sign" takes (readable by its owner alone), and
zephrin.pub.pem, which goes into the trust folder of each box that is to believe it. Files that are
there are never overwritten. A missing DIRECTORY is made.

Examples:
  zpctl keygen ~/keys
  install -m 644 ~/keys/zephrin.pub.pem /etc/zephrin/trust.d/mine.pem

With --json: {"keyFile", "publicKeyFile", "key"}, where "key" is the identifier.)";

// The reason when the file is there already, or cannot be written.
std::optional<std::string> writeNewFile(const std::string& path, std::string_view text,
                                        unsigned mode) {
    const platform::UniqueFd file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, mode));
    const bool written =
        file && ::fchmod(file.get(), mode) == 0 &&
        ::write(file.get(), text.data(), text.size()) == static_cast<ssize_t>(text.size()) &&
        ::fsync(file.get()) == 0;
    if (written)
        return std::nullopt;
    auto reason = path + ": " + std::generic_category().message(errno);
    if (file)
        ::unlink(path.c_str());
    return reason;
}

Status keygen(const std::string& folder, const Session& session) {
    const auto failed = [&](const std::string& reason) {
        return session.fail({Status::refused, reason, {}});
    };
    const auto key = platform::PrivateKey::generate();
    const auto publicKey = key ? key->publicKey() : std::unexpected(key.error());
    if (!publicKey)
        return failed(publicKey.error());
    if (const auto failure = platform::makeFolders(folder, 0700))
        return failed(failure->description.value_or(folder));
    const std::string keyFile = folder + "/zephrin.key.pem";
    const std::string publicKeyFile = folder + "/zephrin.pub.pem";
    if (const auto reason = writeNewFile(publicKeyFile, publicKey->pem(), 0644))
        return failed(*reason);
    if (const auto reason = writeNewFile(keyFile, key->pem(), 0600)) {
        ::unlink(publicKeyFile.c_str());
        return failed(*reason);
    }
    const nlohmann::ordered_json json{
        {"keyFile", keyFile}, {"publicKeyFile", publicKeyFile}, {"key", publicKey->identifier()}};
    return session.report(json, [&] {
        Table table({{"", Tone::faint}, {""}});
        table.add({"Secret key", keyFile});
        table.add({"Public key", publicKeyFile});
        table.add({"Identifier", publicKey->identifier()});
        table.write(session.out(), session.paint());
    });
}

} // namespace

Action declareKeygen(CLI::App& command) {
    const auto folder = std::make_shared<std::string>();
    command.add_option("directory", *folder, "Where the key files go")
        ->type_name("DIRECTORY")
        ->required();
    command.footer(explanation);
    return [folder](Session& session) { return keygen(*folder, session); };
}

} // namespace zpctl
