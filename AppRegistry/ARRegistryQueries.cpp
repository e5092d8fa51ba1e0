#include "AppRegistry/ARPointKeys.h"
#include "AppRegistry/ARRegistry.h"
#include "platform/bundle/InfoKeys.h"

// The questions: answered from the published snapshot, on any thread.

namespace {

// Candidates for the matching rules: narrowed down by the extension point where that is safe.
ARSnapshot::PlugIns candidates(const ARSnapshot& snapshot, const platform::Dictionary& query) {
    const platform::Value* pattern = query.find(platform::InfoKey::extensionPoint);
    const auto keys = pattern ? ARPointKeysOfPattern(*pattern) : std::nullopt;
    return keys ? snapshot.plugInsWithPoints(*keys) : snapshot.plugIns();
}

} // namespace

std::optional<ARRegistry::PlugIns> ARRegistry::installedPlugins() {
    const auto snapshot = context_->published.get();
    return PlugIns(snapshot->plugIns().begin(), snapshot->plugIns().end());
}

std::optional<ARRegistry::PlugIns>
ARRegistry::pluginsMatchingQuery(const platform::Dictionary& query, const Filter& filter) {
    PlugIns kept;
    for (const ARPlugInPtr& plugIn : candidates(*context_->published.get(), query)) {
        if (!filter || filter(plugIn->row().identifier.view(), plugIn->entitlements()))
            kept.push_back(plugIn);
    }
    return kept;
}

ARZephrinProxy::Ptr ARRegistry::zephrinProxyForUUID(const platform::Uuid& uuid) {
    return context_->published.get()->plugIn(uuid);
}

ARZephrinProxy::Ptr ARRegistry::zephrinProxyForPath(std::string_view path) {
    return context_->published.get()->plugInAt(path);
}

ARApplicationProxy::Ptr ARRegistry::applicationProxyForBundlePath(std::string_view path) {
    return context_->published.get()->application(path);
}

std::optional<ARExtensionPoint>
ARRegistry::extensionPointForIdentifier(std::string_view identifier) {
    const ARRowPtr row = context_->published.get()->extensionPoint(identifier);
    if (!row)
        return std::nullopt;
    return ARExtensionPoint{std::string(identifier), context_->infos.dictionary(*row)};
}

ARKnowledge ARRegistry::knowledge() {
    return context_->published.get()->knowledge();
}

void ARRegistry::clearSchemaCaches() {
    context_->infos.clear();
}

void ARRegistry::trustChanged() {
    context_->grants.trustChanged();
}
