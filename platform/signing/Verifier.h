#pragma once

#include <expected>
#include <optional>
#include <string>

#include "platform/signing/FileHashes.h"
#include "platform/signing/SignedFiles.h"
#include "platform/signing/TrustFolder.h"
#include "platform/signing/Verification.h"

namespace platform {

// Finds out what the signatures of programs and bundles grant, with the keys of one trust folder.
// Ownership comes first, then the signature; a file is hashed only after that, and only when it
// has the signed size. So what a stranger made is never read. Owned by the signing service or by
// a tool; any thread.
class Verifier {
public:
    explicit Verifier(std::string trustFolder) : trust_(std::move(trustFolder)) {}

    // The program at a canonical path; with `running`, an open descriptor, only if it is that very
    // file.
    [[nodiscard]] Verification program(const std::string& path,
                                       std::optional<int> running = std::nullopt);
    // The files of a bundle.
    [[nodiscard]] Verification bundle(const SignedFiles& files);
    // A bundle whose files were looked at by someone else.
    [[nodiscard]] Verification bundle(const SignedBundle& bundle);

    [[nodiscard]] TrustFolder& trust() { return trust_; }

private:
    class Look;

    TrustFolder trust_;
    FileHashes hashes_;
};

} // namespace platform
