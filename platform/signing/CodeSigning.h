#pragma once

#include <cstdint>
#include <expected>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/digest/Sha256.h"
#include "platform/ipc/Peer.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// A connected program as the code-signing service knows it: made from the connection's identity,
// asked for entitlement values. Owned by the client object; one thread at a time.
class SigningTask {
public:
    using Done = std::move_only_function<void()>;

    virtual ~SigningTask() = default;

    // Finds out what the program may do; files are read and hashed on the service's own thread.
    // `done` runs once: within the call when the answer is known already, else on that thread. The
    // task must live until then.
    virtual void prepare(Done done) = 0;
    // Looks whether what was found out still holds: the running file, its signature, the keys. If
    // not, the program carries nothing until it is prepared again. A few looks at files, brief.
    virtual void recheck() = 0;
    // The value of an entitlement; nothing when the program does not carry it, or was not prepared.
    [[nodiscard]] virtual std::expected<std::optional<Value>, Error>
    entitlement(std::string_view key) = 0;
};

// What the registry knows of a signed bundle. Refers to the registry's own memory.
struct SignedBundle {
    struct Executable {
        std::uint64_t size;
        Sha256Digest digest;
    };

    std::string_view signature;           // what its file `Signature` holds
    Sha256Digest info;                    // of its Info.plist
    std::optional<Executable> executable; // when it has one
};

// What a signature grants.
struct SignatureGrant {
    std::string key; // identifier of the key that signed
    Dictionary entitlements;
};

// Trusted keys, and what programs and bundles signed with them may do.
class CodeSigning {
public:
    virtual ~CodeSigning() = default;
    [[nodiscard]] virtual std::unique_ptr<SigningTask>
    taskFor(std::shared_ptr<const ipc::Peer> peer) = 0;
    // What the signature of a bundle grants, or why it grants nothing: about 0.2 ms of calculation,
    // and no file but the trusted keys. Any thread.
    [[nodiscard]] virtual std::expected<SignatureGrant, std::string>
    verifyBundle(const SignedBundle& bundle) = 0;
    // Whether the key of a grant still counts. Any thread.
    [[nodiscard]] virtual bool isTrusted(std::string_view key) = 0;
};

} // namespace platform
