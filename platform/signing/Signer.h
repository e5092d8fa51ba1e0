#pragma once

#include <optional>
#include <string>

#include "platform/signing/Ed25519.h"
#include "platform/signing/SignedFiles.h"
#include "platform/value/Value.h"

namespace platform {

// Writes signatures: reads and hashes the files, and puts the signature file where it belongs, in
// place of one that is there. Keeps nothing but the key. Owned by a tool; any thread.
class Signer {
public:
    explicit Signer(PrivateKey key) : key_(std::move(key)) {}

    // On failure the reason; then an old signature file is what it was.
    [[nodiscard]] std::optional<std::string> sign(const SignedFiles& files,
                                                  const Dictionary& entitlements) const;

private:
    PrivateKey key_;
};

} // namespace platform
