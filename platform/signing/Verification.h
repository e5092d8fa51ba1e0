#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/file/File.h"
#include "platform/signing/CodeSigning.h"
#include "platform/signing/SignatureFile.h"
#include "platform/signing/TrustFolder.h"

namespace platform {

// How far a signature came: what was looked at, up to the first thing that was wrong, and what it
// grants when nothing was. Filled by the checks, each of which tells whether to go on. A plain
// value.
class Verification {
public:
    // A larger executable is not hashed.
    static constexpr std::uint64_t largestExecutable = 256ULL << 20;

    // One thing that must hold, in words for people.
    struct Step {
        const char* claim;
        bool passed;
        std::string detail; // on what; for one that failed, why
    };

    // What the grant rests on, besides the keys.
    struct File {
        std::string path;
        FileStamp stamp;
        bool settled; // an equal stamp proves later that it did not change
    };

    [[nodiscard]] const std::vector<Step>& steps() const { return steps_; }

    [[nodiscard]] const std::vector<File>& files() const { return files_; }

    // The identifier of the key that claims to have signed; empty when that was not read.
    [[nodiscard]] const std::string& key() const { return key_; }

    // What the key has signed; nothing before its signature was verified.
    [[nodiscard]] const std::optional<SignedStatement>& statement() const { return statement_; }

    // What counts. REQUIRES: no step failed, and every check was made that belongs to the files
    [[nodiscard]] SignatureGrant grant() const { return {key_, statement_->entitlements}; }

    // The failed step's detail; nothing when none failed.
    [[nodiscard]] std::optional<std::string> refusal() const;

    bool check(const char* claim, std::optional<std::string> refusal, std::string detail);

    void restsOn(File file) { files_.push_back(std::move(file)); }

    // Reads a signature file and verifies its signature.
    bool checkSignature(std::string_view bytes, const TrustedKeys& keys);
    // REQUIRES: the signature was verified, for all below
    bool checkKind(bool hasExecutable, bool hasInfo);
    bool checkExecutableSize(std::uint64_t size);
    bool checkExecutable(const std::expected<Sha256Digest, std::string>& digest);
    bool checkInfo(const std::expected<Sha256Digest, std::string>& digest);

private:
    std::vector<Step> steps_;
    std::vector<File> files_;
    std::string key_;
    std::optional<SignedStatement> statement_;
};

} // namespace platform
