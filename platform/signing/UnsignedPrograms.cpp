#include "platform/signing/UnsignedPrograms.h"

namespace platform {

namespace {

class UnsignedTask final : public SigningTask {
public:
    [[nodiscard]] std::expected<std::optional<Value>, Error>
    entitlement(std::string_view /*key*/) override {
        return std::nullopt;
    }
};

} // namespace

std::unique_ptr<SigningTask> UnsignedPrograms::taskFor(const ipc::Peer& /*peer*/) {
    return std::make_unique<UnsignedTask>();
}

std::optional<Dictionary> UnsignedPrograms::bundleEntitlements(std::string_view /*path*/) {
    return std::nullopt;
}

} // namespace platform
