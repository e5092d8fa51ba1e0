#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "AppRegistry/ARApplicationProxy.h"
#include "AppRegistry/ARExtensionPoint.h"
#include "AppRegistry/ARZephrinProxy.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

// What the registry knows at one moment: a new UUID and a higher sequence number with every
// change. No UUID while nothing is known.
struct ARKnowledge {
    std::optional<platform::Uuid> uuid;
    std::uint64_t sequence = 0;
};

// Told of what the registry installs and removes, on the registry's queue, after the commit and
// with no lock held.
class ARWorkspaceObserver {
public:
    virtual ~ARWorkspaceObserver() = default;
    virtual void pluginsDidInstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) = 0;
    virtual void pluginsWillUninstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) = 0;
};

// Access to the registry of installed applications and plug-ins. Queries read an unchanging
// snapshot and take no lock that a writer holds while working. Any thread.
class ARApplicationWorkspace {
public:
    using PlugIns = std::vector<ARZephrinProxy::Ptr>;
    // Whether a plug-in stays in a query's answer: asked with identifier and entitlements.
    using Filter = std::function<bool(std::string_view identifier,
                                      const std::optional<platform::Dictionary>& entitlements)>;

    virtual ~ARApplicationWorkspace() = default;

    // Everything installed, in a stable order; nothing when the query fails.
    [[nodiscard]] virtual std::optional<PlugIns> installedPlugins() = 0;
    // Everything that the matching rules of `query` could accept (a superset: the registry only
    // narrows by the extension point) and `filter` keeps.
    [[nodiscard]] virtual std::optional<PlugIns>
    pluginsMatchingQuery(const platform::Dictionary& query, const Filter& filter) = 0;

    [[nodiscard]] virtual ARZephrinProxy::Ptr zephrinProxyForUUID(const platform::Uuid& uuid) = 0;
    [[nodiscard]] virtual ARZephrinProxy::Ptr
    zephrinProxyForPath(std::string_view canonicalPath) = 0;
    [[nodiscard]] virtual ARApplicationProxy::Ptr
    applicationProxyForBundlePath(std::string_view canonicalPath) = 0;
    [[nodiscard]] virtual std::optional<ARExtensionPoint>
    extensionPointForIdentifier(std::string_view identifier) = 0;

    [[nodiscard]] virtual ARKnowledge knowledge() = 0;

    // The sequence number of it, 0 while nothing is known: the same one again means that nothing
    // changed. For those who ask often.
    [[nodiscard]] virtual std::uint64_t knowledgeSequence() {
        const ARKnowledge known = knowledge();
        return known.uuid ? known.sequence : 0;
    }

    // Adds a bundle by path, or takes one away; nothing on success.
    [[nodiscard]] virtual std::optional<platform::Error> registerPlugin(std::string_view path) = 0;
    [[nodiscard]] virtual std::optional<platform::Error>
    unregisterPlugin(std::string_view path) = 0;

    // Drops what was derived from info dictionaries and can be derived again.
    virtual void clearSchemaCaches() = 0;
    // The trusted keys may be others: what signatures grant is looked up anew when asked for.
    virtual void trustChanged() = 0;

    // The observer must outlive the workspace or be taken away before it goes.
    virtual void setObserver(ARWorkspaceObserver* observer) = 0;
};
