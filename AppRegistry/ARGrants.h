#pragma once

#include <atomic>
#include <cstdint>
#include <expected>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "AppRegistry/ARSignature.h"
#include "platform/value/TextPool.h"
#include "platform/value/Value.h"

namespace platform {
class CodeSigning;
struct SignatureGrant;
} // namespace platform

class ARStore;
struct ARBundleContent;

// What a proxy remembers of its entitlements. Written and read by the grants alone.
struct ARKnownGrant {
    std::uint64_t trust = 0; // when it was looked up; 0 for never
    std::optional<platform::Dictionary> entitlements;
};

// What the signatures of plug-ins grant. A pass has every signature judged that it reads; what was
// found is stored, so that asking later takes no calculation as long as the key is trusted. Each
// reason why a signature does not count is said once, until the plug-in changes.
//
// Shared by the registry and its proxies as part of their context; the signing service must outlive
// it. Any thread.
class ARGrants {
public:
    ARGrants(std::shared_ptr<const ARStore> store, platform::CodeSigning& signing)
        : store_(std::move(store)), signing_(signing) {}

    // Verifies the signature of a bundle that was read; nothing when it is no plug-in, has none, or
    // one that is too large to be kept.
    [[nodiscard]] std::optional<ARSignature> judge(const ARBundleContent& content);
    // What the signature of an entry grants now; nothing when it does not count.
    [[nodiscard]] std::optional<platform::Dictionary> entitlements(const ARBundleRow& row,
                                                                   ARKnownGrant& known);

    // The trusted keys may be others: everything is looked up anew.
    void trustChanged() { ++trust_; }

    // The plug-in at a path has gone, or is another one now.
    void forget(std::string_view path);

    // Calls `handler` when there is something new to store: signatures that were judged again with
    // another result. Without their content; none is handed out twice. The handler must not wait.
    void onLearnt(std::function<void()> handler);
    [[nodiscard]] std::vector<ARSignatureOfEntry> takeLearnt();

private:
    using Grant = std::expected<platform::SignatureGrant, std::string>;

    [[nodiscard]] Grant verify(const ARBundleRow& row, const ARDigests& digests,
                               std::string_view signature);
    [[nodiscard]] std::optional<platform::Dictionary> lookUp(const ARBundleRow& row,
                                                             std::uint64_t trust);
    [[nodiscard]] std::optional<platform::Dictionary> decode(const std::string& entitlements);
    [[nodiscard]] bool isTrusted(const std::string& key, std::uint64_t trust);
    void learn(std::int64_t id, const platform::SignatureGrant& grant);
    void complain(const ARBundleRow& row, const std::string& reason);

    const std::shared_ptr<const ARStore> store_;
    platform::CodeSigning& signing_;
    std::atomic<std::uint64_t> trust_ = 1; // changes with the trusted keys

    std::mutex lock_; // held for a look or a change, and around `onLearnt_`
    platform::TextPool keys_;
    std::set<std::string> trusted_; // keys that were asked for when `trust_` was ...
    std::uint64_t trustedAt_ = 0;   // ... this
    std::set<std::pair<std::string, std::string>> complaints_; // path and reason
    std::vector<ARSignatureOfEntry> learnt_;
    std::function<void()> onLearnt_;
};
