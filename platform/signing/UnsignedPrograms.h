#pragma once

#include "platform/signing/CodeSigning.h"

namespace platform {

// The code-signing service of a box that trusts no signature: no program has entitlements.
// No state; any thread.
class UnsignedPrograms final : public CodeSigning {
public:
    [[nodiscard]] std::unique_ptr<SigningTask> taskFor(const ipc::Peer& peer) override;
    [[nodiscard]] std::optional<Dictionary> bundleEntitlements(std::string_view path) override;
};

} // namespace platform
