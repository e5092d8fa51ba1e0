#pragma once

#include <string>

#include "platform/queue/SerialQueue.h"
#include "platform/signing/CodeSigning.h"
#include "platform/signing/RefusalLog.h"
#include "platform/signing/Verifier.h"

namespace platform {

// The code-signing service: programs and bundles may do what a signature with a trusted key says.
// Files are read on its queue, "signing". Owned by main, outlives its tasks; any thread.
class SignedPrograms final : public CodeSigning {
public:
    explicit SignedPrograms(std::string trustFolder) : verifier_(std::move(trustFolder)) {}

    [[nodiscard]] std::unique_ptr<SigningTask>
    taskFor(std::shared_ptr<const ipc::Peer> peer) override;
    [[nodiscard]] std::expected<SignatureGrant, std::string>
    verifyBundle(const SignedBundle& bundle) override;
    [[nodiscard]] bool isTrusted(std::string_view key) override;

private:
    class Task;

    Verifier verifier_;
    RefusalLog refusals_;
    SerialQueue queue_{"signing"}; // last, so that its blocks end before the rest goes
};

} // namespace platform
