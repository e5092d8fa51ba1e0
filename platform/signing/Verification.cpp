#include "platform/signing/Verification.h"

#include <cassert>

namespace platform {

namespace {

// What a digest was expected to be, against what it is.
std::optional<std::string> mismatch(const std::expected<Sha256Digest, std::string>& digest,
                                    const Sha256Digest& expected, const std::string& what) {
    if (!digest)
        return what + " cannot be hashed: " + digest.error();
    return *digest == expected ? std::nullopt
                               : std::optional(what + " is not what it was when it was signed");
}

std::string filesText(bool hasExecutable, bool hasInfo) {
    if (!hasInfo)
        return "an executable outside a bundle";
    return hasExecutable ? "a bundle with an executable" : "a bundle without executable";
}

} // namespace

std::optional<std::string> Verification::refusal() const {
    if (steps_.empty() || steps_.back().passed)
        return std::nullopt;
    return steps_.back().detail;
}

bool Verification::check(const char* claim, std::optional<std::string> refusal,
                         std::string detail) {
    const bool passed = !refusal;
    steps_.push_back({claim, passed, passed ? std::move(detail) : std::move(*refusal)});
    return passed;
}

bool Verification::checkSignature(std::string_view bytes, const TrustedKeys& keys) {
    const auto file = SignatureFile::decoded(bytes);
    if (!check("The signature file is well formed",
               file ? std::nullopt : std::optional("the signature file: " + file.error()),
               std::to_string(bytes.size()) + " bytes"))
        return false;
    key_ = file->keyIdentifier;
    const auto key = keys.find(key_);
    if (!check("The key is trusted",
               key == keys.end() ? std::optional("the key " + key_ + " is not trusted")
                                 : std::nullopt,
               key_))
        return false;
    const bool verified =
        key->second.verifies(SignatureFile::signedBytes(file->statement), file->signature);
    if (!check("The signature is that key's",
               verified ? std::nullopt : std::optional("the signature is not of the key " + key_),
               "Ed25519"))
        return false;
    auto statement = SignedStatement::decoded(file->statement);
    if (!check("What was signed can be read",
               statement ? std::nullopt
                         : std::optional("the signed statement: " + statement.error()),
               statement ? statement->identifier : std::string()))
        return false;
    statement_ = std::move(*statement);
    return true;
}

bool Verification::checkKind(bool hasExecutable, bool hasInfo) {
    assert(statement_);
    const bool same = statement_->executable.has_value() == hasExecutable &&
                      statement_->info.has_value() == hasInfo;
    const std::string found = filesText(hasExecutable, hasInfo);
    const std::string refusal =
        "signed was " +
        filesText(statement_->executable.has_value(), statement_->info.has_value()) + ", this is " +
        found;
    return check("It was signed for files of this kind",
                 same ? std::nullopt : std::optional(refusal), found);
}

bool Verification::checkExecutableSize(std::uint64_t size) {
    assert(statement_ && statement_->executable);
    const std::uint64_t expected = statement_->executable->size;
    const std::string refusal = "the executable has " + std::to_string(size) +
                                " bytes, signed were " + std::to_string(expected);
    if (!check("The executable has the signed size",
               size == expected ? std::nullopt : std::optional(refusal),
               std::to_string(size) + " bytes"))
        return false;
    return size <= largestExecutable ||
           check("The executable is small enough to be hashed",
                 "the executable is larger than " + std::to_string(largestExecutable) + " bytes",
                 {});
}

bool Verification::checkExecutable(const std::expected<Sha256Digest, std::string>& digest) {
    assert(statement_ && statement_->executable);
    return check("The executable has the signed content",
                 mismatch(digest, statement_->executable->digest, "the executable"), "SHA-256");
}

bool Verification::checkInfo(const std::expected<Sha256Digest, std::string>& digest) {
    assert(statement_ && statement_->info);
    return check("Info.plist has the signed content",
                 mismatch(digest, *statement_->info, "Info.plist"), "SHA-256");
}

} // namespace platform
