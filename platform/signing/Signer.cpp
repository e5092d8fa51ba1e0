#include "platform/signing/Signer.h"

#include <sys/stat.h>

#include "platform/bundle/Bundle.h"
#include "platform/bundle/InfoKeys.h"
#include "platform/digest/Sha256.h"
#include "platform/file/File.h"
#include "platform/signing/SignatureFile.h"
#include "platform/signing/Verification.h"

namespace platform {

namespace {

std::string lastPart(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

// The bundle's own identifier, else the name of the bundle or executable.
std::string identifierOf(const SignedFiles& files) {
    if (!files.bundle)
        return lastPart(files.executable.value_or(""));
    const BundleReader bundle = BundleReader::atPath(*files.bundle);
    const Dictionary* const info = bundle.infoDictionary();
    const Value* const identifier = info ? info->find(InfoKey::bundleIdentifier) : nullptr;
    const auto text = identifier ? identifier->string() : std::nullopt;
    return text ? std::string(*text) : lastPart(*files.bundle);
}

std::expected<SignedStatement::Executable, std::string> executableAt(const std::string& path) {
    const auto file = openRegularFile(path);
    struct ::stat status = {};
    if (!file || ::fstat(file->get(), &status) != 0)
        return std::unexpected(file ? path : file.error().description.value_or(path));
    const auto digest = Sha256().ofOpenFile(file->get(), Verification::largestExecutable);
    if (!digest)
        return std::unexpected(path + ": " + digest.error());
    return SignedStatement::Executable{static_cast<std::uint64_t>(status.st_size), *digest};
}

std::expected<SignedStatement, std::string> statementOf(const SignedFiles& files,
                                                        const Dictionary& entitlements) {
    SignedStatement statement{identifierOf(files), std::nullopt, std::nullopt, entitlements};
    if (files.executable) {
        const auto executable = executableAt(*files.executable);
        if (!executable)
            return std::unexpected(executable.error());
        statement.executable = *executable;
    }
    if (const auto info = files.info()) {
        const auto digest = Sha256().ofFile(*info);
        if (!digest)
            return std::unexpected(digest.error());
        statement.info = *digest;
    }
    return statement;
}

std::expected<std::string, std::string> signedBy(const PrivateKey& key,
                                                 const SignedStatement& statement) {
    const auto bytes = statement.encoded();
    if (!bytes)
        return bytes;
    const auto publicKey = key.publicKey();
    if (!publicKey)
        return std::unexpected(publicKey.error());
    const auto signature = key.sign(SignatureFile::signedBytes(*bytes));
    if (!signature)
        return signature;
    return SignatureFile{publicKey->identifier(), *signature, *bytes}.encoded();
}

} // namespace

std::optional<std::string> Signer::sign(const SignedFiles& files,
                                        const Dictionary& entitlements) const {
    const auto statement = statementOf(files, entitlements);
    if (!statement)
        return statement.error();
    const auto bytes = signedBy(key_, *statement);
    if (!bytes)
        return bytes.error();
    const auto failure = writeFileAtomically(files.signature(), *bytes);
    return failure
               ? std::optional(failure->description.value_or("the signature file was not written"))
               : std::nullopt;
}

} // namespace platform
