#include "platform/signing/UnsignedPrograms.h"

namespace platform {

namespace {

class UnsignedTask final : public SigningTask {
public:
    void prepare(Done done) override { done(); }

    void recheck() override {}

    [[nodiscard]] std::expected<std::optional<Value>, Error>
    entitlement(std::string_view /*key*/) override {
        return std::nullopt;
    }
};

} // namespace

std::unique_ptr<SigningTask> UnsignedPrograms::taskFor(std::shared_ptr<const ipc::Peer> /*peer*/) {
    return std::make_unique<UnsignedTask>();
}

std::expected<SignatureGrant, std::string>
UnsignedPrograms::verifyBundle(const SignedBundle& /*bundle*/) {
    return std::unexpected("no key is trusted");
}

bool UnsignedPrograms::isTrusted(std::string_view /*key*/) {
    return false;
}

} // namespace platform
