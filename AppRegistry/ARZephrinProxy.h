#pragma once

#include <memory>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

#include "AppRegistry/ARApplicationProxy.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

// One plug-in as the registry knows it: an unchanging view of one entry. The registry hands out
// the same object for as long as the entry has not moved, so that pointer equality tells
// "unchanged". Shared by whoever asked for it; any thread.
class ARZephrinProxy {
public:
    using Ptr = std::shared_ptr<const ARZephrinProxy>;

    virtual ~ARZephrinProxy() = default;
    [[nodiscard]] virtual const platform::Uuid& plugInUUID() const = 0;
    [[nodiscard]] virtual std::optional<std::string> bundlePath() const = 0; // canonical

    [[nodiscard]] virtual bool hasBundlePath() const { return bundlePath().has_value(); }

    [[nodiscard]] virtual std::optional<std::string> plugInIdentifier() const = 0;
    // The identifier under which this path was first registered.
    [[nodiscard]] virtual std::optional<std::string> originalIdentifier() const = 0;
    // The whole Info.plist, "HXExtensionPointIdentifier" copied to the top level unless there.
    [[nodiscard]] virtual std::optional<platform::Dictionary> infoDictionary() const = 0;
    // Its "HXExtension" entry.
    [[nodiscard]] virtual std::optional<platform::Dictionary> plugInDictionary() const = 0;
    // What its signature grants at this moment; nothing when it does not count.
    [[nodiscard]] virtual std::optional<platform::Dictionary> entitlements() const = 0;
    [[nodiscard]] virtual platform::Date registrationDate() const = 0;
    [[nodiscard]] virtual bool isOnSystemPartition() const = 0;
    // In the language in use; nothing when the bundle has no such name.
    [[nodiscard]] virtual std::optional<std::string> localizedName() const = 0;
    [[nodiscard]] virtual std::optional<std::string> localizedShortName() const = 0;
    // Nothing when the plug-in stands alone.
    [[nodiscard]] virtual ARApplicationProxy::Ptr containingBundle() const = 0;
    // The plug-in's data container, made if missing.
    [[nodiscard]] virtual std::optional<std::string> dataContainerPath() const = 0;
    // The user id that its processes run as, and that the container belongs to. Nothing when the
    // daemon does not run as root: then they run as its own user.
    [[nodiscard]] virtual std::optional<uid_t> userIdentifier() const = 0;
    // "BQBundleIdentifier" and "BQBundleVersion".
    [[nodiscard]] virtual std::optional<std::string> bundleIdentifier() const = 0;
    [[nodiscard]] virtual std::optional<std::string> bundleVersion() const = 0;
};

// "<ARZephrinProxy identifier uuid path>", for log lines.
[[nodiscard]] std::string describe(const ARZephrinProxy& proxy);
// "(<...>, <...>)"
[[nodiscard]] std::string describeAll(const std::vector<ARZephrinProxy::Ptr>& proxies);
