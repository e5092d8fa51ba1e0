#pragma once

#include "platform/signing/CodeSigning.h"

namespace platform {

// The code-signing service of a box that trusts no signature: no program has entitlements.
// No state; any thread.
class UnsignedPrograms final : public CodeSigning {
public:
    [[nodiscard]] std::unique_ptr<SigningTask> taskFor(std::shared_ptr<const ipc::Peer> peer) override;
    [[nodiscard]] std::expected<SignatureGrant, std::string>
    verifyBundle(const SignedBundle& bundle) override;
    [[nodiscard]] bool isTrusted(std::string_view key) override;
};

} // namespace platform
