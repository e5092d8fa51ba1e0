#pragma once

#include <expected>
#include <memory>
#include <optional>
#include <string_view>

#include "platform/ipc/Peer.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// A connected program as the code-signing service knows it: made from the connection's identity,
// asked for entitlement values. Owned by the client object; any thread, one at a time.
class SigningTask {
public:
    virtual ~SigningTask() = default;
    // The value of an entitlement; nothing when the program does not carry it.
    [[nodiscard]] virtual std::expected<std::optional<Value>, Error>
    entitlement(std::string_view key) = 0;
};

class CodeSigning {
public:
    virtual ~CodeSigning() = default;
    [[nodiscard]] virtual std::unique_ptr<SigningTask> taskFor(const ipc::Peer& peer) = 0;
    // The entitlements that the signature of a bundle grants; nothing when it has none that counts.
    [[nodiscard]] virtual std::optional<Dictionary> bundleEntitlements(std::string_view path) = 0;
};

} // namespace platform
