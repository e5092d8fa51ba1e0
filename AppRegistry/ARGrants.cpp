#include "AppRegistry/ARGrants.h"

#include <utility>

#include "AppRegistry/ARBundleReader.h"
#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARStore.h"
#include "platform/ipc/Cbor.h"
#include "platform/signing/CodeSigning.h"

using platform::Dictionary;

namespace {

ARSignature judged(std::string content, const platform::SignatureGrant& grant) {
    return {std::move(content), grant.key, platform::ipc::encode(grant.entitlements)};
}

bool isSigned(const ARBundleRow& row) {
    return row.kind == ARKind::plugIn && row.stamps[signatureFile].present();
}

} // namespace

// ---- Signatures that were read

std::optional<ARSignature> ARGrants::judge(const ARBundleContent& content) {
    const ARBundleRow& row = content.row;
    if (!isSigned(row))
        return std::nullopt;
    if (!content.signature) {
        complain(row, "it is too large");
        return std::nullopt;
    }
    const Grant grant = verify(row, content.digests, *content.signature);
    if (grant)
        return judged(*content.signature, *grant);
    return ARSignature{*content.signature, {}, {}};
}

ARGrants::Grant ARGrants::verify(const ARBundleRow& row, const ARDigests& digests,
                                 std::string_view signature) {
    platform::SignedBundle bundle{signature, digests[infoFile], std::nullopt};
    const ARStamp& executable = row.stamps[executableFile];
    if (executable.present())
        bundle.executable = {executable.size, digests[executableFile]};
    Grant grant = executable.size > ARLargestHashed
                      ? std::unexpected("the executable is too large to be hashed")
                      : signing_.verifyBundle(bundle);
    if (!grant)
        complain(row, grant.error());
    return grant;
}

// ---- Questions

std::optional<Dictionary> ARGrants::entitlements(const ARBundleRow& row, ARKnownGrant& known) {
    if (!isSigned(row))
        return std::nullopt;
    const std::uint64_t trust = trust_;
    {
        const std::lock_guard lock(lock_);
        if (known.trust == trust)
            return known.entitlements;
    }
    auto granted = lookUp(row, trust);
    const std::lock_guard lock(lock_);
    known = {trust, granted};
    return granted;
}

std::optional<Dictionary> ARGrants::lookUp(const ARBundleRow& row, std::uint64_t trust) {
    const auto facts = store_->signature(row.id);
    if (!facts)
        return std::nullopt;
    if (isTrusted(facts->signature.key, trust)) {
        if (auto entitlements = decode(facts->signature.entitlements))
            return entitlements;
    }
    const Grant grant = verify(row, facts->digests, facts->signature.content);
    if (!grant)
        return std::nullopt;
    learn(row.id, *grant);
    return grant->entitlements;
}

std::optional<Dictionary> ARGrants::decode(const std::string& entitlements) {
    const std::lock_guard lock(lock_);
    const auto decoded = platform::ipc::decode(entitlements, {.keys = &keys_});
    if (!decoded || !decoded->dictionary())
        return std::nullopt;
    return *decoded->dictionary();
}

bool ARGrants::isTrusted(const std::string& key, std::uint64_t trust) {
    {
        const std::lock_guard lock(lock_);
        if (trustedAt_ == trust && trusted_.contains(key))
            return true;
    }
    if (key.empty() || !signing_.isTrusted(key))
        return false;
    const std::lock_guard lock(lock_);
    if (std::exchange(trustedAt_, trust) != trust)
        trusted_.clear();
    trusted_.insert(key);
    return true;
}

// ---- What came out

void ARGrants::learn(std::int64_t id, const platform::SignatureGrant& grant) {
    const std::lock_guard lock(lock_);
    learnt_.push_back({id, judged({}, grant)});
    if (onLearnt_ && learnt_.size() == 1)
        onLearnt_();
}

void ARGrants::onLearnt(std::function<void()> handler) {
    const std::lock_guard lock(lock_);
    onLearnt_ = std::move(handler);
}

std::vector<ARSignatureOfEntry> ARGrants::takeLearnt() {
    const std::lock_guard lock(lock_);
    return std::exchange(learnt_, {});
}

void ARGrants::complain(const ARBundleRow& row, const std::string& reason) {
    const std::lock_guard lock(lock_);
    if (complaints_.emplace(row.path.view(), reason).second)
        ARLog().error("the signature of %{public}@ does not count: %{public}@", row.path.view(),
                      reason);
}

void ARGrants::forget(std::string_view path) {
    const std::lock_guard lock(lock_);
    auto said = complaints_.lower_bound({std::string(path), {}});
    while (said != complaints_.end() && said->first == path)
        said = complaints_.erase(said);
}
