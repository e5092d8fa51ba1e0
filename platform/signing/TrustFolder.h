#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "platform/signing/Ed25519.h"

namespace platform {

// The keys that count at one time, by identifier. Never changes; shared.
using TrustedKeys = std::map<std::string, PublicKey, std::less<>>;

// The folder of trusted public keys (*.pem, one key each). Looked at anew on each request, read
// again when the folder or a key changed. The folder, the folders above it and each key must pass
// the ownership test, or are ignored with one error line for each state. Owned by the signing
// service; any thread.
class TrustFolder {
public:
    static constexpr std::size_t mostKeys = 64;
    static constexpr std::size_t largestKey = 64UL << 10;

    explicit TrustFolder(std::string path);
    ~TrustFolder();

    // What counts now; never empty-handed, perhaps without keys. The same object as long as
    // nothing changed.
    [[nodiscard]] std::shared_ptr<const TrustedKeys> keys();

    [[nodiscard]] const std::string& path() const { return path_; }

private:
    struct State; // what was read, and what tells that it is unchanged

    const std::string path_;
    std::mutex mutex_;
    std::unique_ptr<const State> state_;
};

} // namespace platform
