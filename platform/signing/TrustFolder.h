#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/file/File.h"
#include "platform/signing/Ed25519.h"

namespace platform {

// The keys that count at one time, by identifier. Never changes; shared.
using TrustedKeys = std::map<std::string, PublicKey, std::less<>>;

// The folder of trusted public keys (*.pem). Looked at anew on each request, read again when the
// folder or a key changed. The folder and each key must pass the ownership test, or are ignored
// with one error line for each state. Owned by the signing service; any thread.
class TrustFolder {
public:
    explicit TrustFolder(std::string path) : path_(std::move(path)) {}

    // What counts now; never empty-handed, perhaps without keys. The same object as long as
    // nothing changed.
    [[nodiscard]] std::shared_ptr<const TrustedKeys> keys();

    [[nodiscard]] const std::string& path() const { return path_; }

private:
    struct State; // what was read, and what tells that it is unchanged

    const std::string path_;
    std::mutex mutex_;
    std::shared_ptr<const State> state_;
};

} // namespace platform
