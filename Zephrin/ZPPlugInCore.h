#pragma once

#include <cstddef>
#include <cstdint>
#include <expected>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

class ZPExtensionPoints;

// One installed plug-in as daemon and client library share it: identity, location, information
// dictionary, names and annotations. It crosses between them as a form, a flat dictionary.
//
// Shared by whoever holds it. Set up once, by one thread, which may resolve its SDK too, before
// anyone else sees it; afterwards only names and annotations change. Those may be read and set from
// any thread; of two changes to the annotations at the same time one may be lost, unless the
// callers take turns. Records are equal when their UUIDs are.
class ZPPlugInCore {
public:
    using Ptr = std::shared_ptr<ZPPlugInCore>;

    // A record with nothing in it.
    ZPPlugInCore() = default;
    ZPPlugInCore(const ZPPlugInCore&) = delete;
    ZPPlugInCore& operator=(const ZPPlugInCore&) = delete;
    virtual ~ZPPlugInCore() = default;

    // A record of what is given; empty when it makes no plug-in. Without `uuid` it gets a new one.
    // `info` serves where `bundleInfo` brings no plug-in dictionary.
    [[nodiscard]] static Ptr create(std::optional<std::string> identifier,
                                    std::optional<std::string> path,
                                    const std::optional<platform::Dictionary>& bundleInfo,
                                    const std::optional<platform::Dictionary>& info,
                                    std::optional<platform::Uuid> uuid);
    // The record of a form; empty when the form makes no plug-in.
    [[nodiscard]] static Ptr createWithForm(const platform::Dictionary& form);

    // ---- Identity and location

    // REQUIRES: the record was set up
    [[nodiscard]] const platform::Uuid& uuid() const;

    [[nodiscard]] const std::string& identifier() const { return identifier_; }

    [[nodiscard]] const std::optional<std::string>& originalIdentifier() const {
        return originalIdentifier_;
    }

    [[nodiscard]] const std::string& path() const { return path_; }

    [[nodiscard]] std::string url() const; // the file URL of `path`

    [[nodiscard]] const std::optional<std::string>& containingPath() const {
        return containingPath_;
    }

    [[nodiscard]] std::optional<std::string> containingUrl() const;

    [[nodiscard]] bool onSystemVolume() const { return onSystemVolume_; }

    [[nodiscard]] virtual std::optional<std::string> dataContainerPath() const { return {}; }

    // ---- Facts

    [[nodiscard]] const std::optional<platform::Dictionary>& entitlements() const {
        return entitlements_;
    }

    [[nodiscard]] std::uint64_t hubProtocolVersion() const { return hubProtocolVersion_; }

    // Seconds since the Unix epoch.
    [[nodiscard]] std::int64_t lastModified() const { return lastModified_; }

    [[nodiscard]] platform::Date timestamp() const;

    [[nodiscard]] const std::optional<platform::Data>& cdhash() const { return cdhash_; }

    [[nodiscard]] const std::optional<std::string>& requirement() const { return requirement_; }

    // ---- Names and annotations

    [[nodiscard]] std::optional<std::string> localizedName() const;
    [[nodiscard]] std::optional<std::string> localizedShortName() const;
    [[nodiscard]] std::optional<std::string> localizedContainingName() const;
    virtual void setLocalizedName(std::optional<std::string> name);
    virtual void setLocalizedShortName(std::optional<std::string> name);
    virtual void setLocalizedContainingName(std::optional<std::string> name);

    [[nodiscard]] std::optional<platform::Dictionary> annotations() const;
    // Sets one annotation, or takes it away when there is no value. A record without any
    // annotations dictionary stays without.
    void setAnnotation(std::string_view key, std::optional<platform::Value> value);
    // Takes over the annotations of a form, and nothing else.
    void updateFromForm(const platform::Dictionary& form);

    // ---- Dictionaries

    // The whole information dictionary, and the plug-in's own part of it.
    [[nodiscard]] virtual std::optional<platform::Dictionary> bundleInfoDictionary() const;
    [[nodiscard]] std::optional<platform::Dictionary> plugInDictionary() const;

    // One entry of the information dictionary, of the plug-in dictionary, of the attributes.
    [[nodiscard]] virtual std::optional<platform::Value> infoKey(std::string_view key) const;
    [[nodiscard]] virtual std::optional<platform::Value> pluginKey(std::string_view key) const;
    [[nodiscard]] virtual std::optional<platform::Value> attribute(std::string_view key) const;

    // Takes over an information dictionary and the plug-in dictionary in it; false when there is
    // none. The former is kept all the same.
    bool setDictionaries(const platform::Dictionary& info);
    // Completes the plug-in dictionary: attributes, and a version in them.
    void canonicalize();

    // ---- Defaults from the extension point, the plug-in's SDK (ZPPlugInSDK.cpp)

    // What the records of this process ask for extension points: the files of this system's
    // ExtensionPoints folders unless something else is set. Any thread.
    // REQUIRES: set at most once, before any record resolves its SDK
    static void setExtensionPoints(std::shared_ptr<const ZPExtensionPoints> points);
    // The SDK dictionary of an extension point; nothing, with a log line, when there is none.
    [[nodiscard]] static std::optional<platform::Dictionary>
    readSDKDictionary(std::string_view identifier);
    // Merges the SDK dictionary of the record's extension point into its own and makes that
    // canonical; without such an extension point it is made canonical as it is. Reads a file.
    // REQUIRES: the record has an information dictionary
    void resolveSDK();
    // What the plug-in says, and below that, at every depth, what only the SDK says. The SDK wins
    // where `sdkOverridesKey`; lists of shared resources are united. Where one of two values is not
    // a dictionary the plug-in's stays. Nests as deeply as the arguments do, which no reader lets
    // pass 64 levels.
    [[nodiscard]] static platform::Dictionary mergeDictionary(const platform::Dictionary& sdk,
                                                              const platform::Dictionary& plugIn);
    [[nodiscard]] static bool sdkOverridesKey(std::string_view key);
    // Every value of the two once, in no defined order.
    [[nodiscard]] static platform::Array
    mergeSharedResources(const std::optional<platform::Array>& sdk,
                         const std::optional<platform::Array>& plugIn);

    // Called with the values found, or with the error.
    using LocalizedCompletion = std::function<void(const std::optional<platform::Dictionary>&,
                                                   const std::optional<platform::Error>&)>;
    // The information dictionary's values for these keys, names in the language in use; keys that
    // have none are left out. All values must be fit for an archive: null and encoded records,
    // at any depth, are not, and one of those makes the whole look-up fail. Calls `completion`
    // once, before it returns.
    void localizedInfoDictionaryForKeys(std::span<const std::string> keys,
                                        const LocalizedCompletion& completion) const;

    // ---- Derived from the dictionaries; specs are strings in a sound plug-in

    [[nodiscard]] std::optional<platform::Dictionary> attributes() const;
    [[nodiscard]] virtual std::optional<std::string> version() const;
    // The version as a form carries it: "<none>" when there is none.
    [[nodiscard]] std::string exportedVersion() const;
    [[nodiscard]] std::optional<platform::Value> protocolSpec() const;
    [[nodiscard]] std::optional<platform::Value> principalSpec() const;
    [[nodiscard]] std::optional<platform::Value> sdkSpec() const; // the extension point
    [[nodiscard]] std::optional<platform::Value> embeddedProtocolSpec() const;

    [[nodiscard]] std::optional<std::string> embeddedCodePath() const { return {}; }

    [[nodiscard]] bool isAppExtension() const;

    [[nodiscard]] bool isMultiplexed() const { return false; }

    [[nodiscard]] bool isHybrid() const;
    [[nodiscard]] virtual bool isDedicated() const;
    [[nodiscard]] bool isData() const;
    // True for the older configuration style.
    // REQUIRES: the information dictionary has one of the two styles
    [[nodiscard]] bool oldStyle() const;

    // ---- Operations

    // The form of the record. An error when there is nothing to make one of; never from a record
    // of this class.
    // REQUIRES: the record was set up, with dictionaries and original identifier
    [[nodiscard]] virtual std::expected<platform::Dictionary, platform::Error> exportForm() const;

    // What makes the plug-in's definition unacceptable, if anything.
    [[nodiscard]] virtual std::optional<platform::Error> diagnose() const;

    // A hook for records that know more of an interface.
    [[nodiscard]] virtual std::optional<platform::Value>
    augmentInterface(const platform::Value& interface) const;

    // REQUIRES: both records were set up
    [[nodiscard]] bool isEqual(const ZPPlugInCore& other) const;
    [[nodiscard]] std::size_t hash() const;

protected:
    // Sets up a new record; false when it makes no plug-in.
    [[nodiscard]] bool setup(std::optional<std::string> identifier, std::optional<std::string> path,
                             const std::optional<platform::Dictionary>& bundleInfo,
                             std::optional<platform::Uuid> uuid);
    [[nodiscard]] bool setupWithForm(const platform::Dictionary& form);
    // Reshapes a raw information dictionary before it is kept.
    [[nodiscard]] virtual platform::Dictionary
    normalizeInfoDictionary(const platform::Dictionary& info) const;
    // The form, of these dictionaries.
    [[nodiscard]] platform::Dictionary formOf(const platform::Dictionary& bundleInfo,
                                              const platform::Dictionary& info) const;

    void setPlugInDictionary(std::optional<platform::Dictionary> info);

    void setOriginalIdentifier(std::optional<std::string> s) { originalIdentifier_ = std::move(s); }

    void setContainingPath(std::optional<std::string> p) { containingPath_ = std::move(p); }

    void setOnSystemVolume(bool is) { onSystemVolume_ = is; }

    void setEntitlements(std::optional<platform::Dictionary> e) { entitlements_ = std::move(e); }

    void setHubProtocolVersion(std::uint64_t version) { hubProtocolVersion_ = version; }

    void setLastModified(std::int64_t seconds) { lastModified_ = seconds; }

    // Guards what may change after the set-up.
    [[nodiscard]] std::unique_lock<std::recursive_mutex> locked() const {
        return std::unique_lock(mutex_);
    }

private:
    void mergeSDK(const platform::Dictionary& sdk, const platform::Dictionary& info);
    [[nodiscard]] std::optional<platform::Value>
    localizedValue(std::string_view key, const platform::Dictionary& info) const;
    void addNames(platform::Dictionary& form, platform::Dictionary& bundleInfo) const;

    mutable std::recursive_mutex mutex_;
    std::optional<platform::Dictionary> plugInDictionary_;
    std::string identifier_;
    std::optional<std::string> originalIdentifier_;
    std::string path_;
    std::optional<std::string> containingPath_;
    std::optional<platform::Dictionary> bundleInfoDictionary_;
    bool onSystemVolume_ = false;
    std::optional<platform::Dictionary> entitlements_;
    std::uint64_t hubProtocolVersion_ = 0;
    std::optional<std::string> localizedName_;
    std::optional<std::string> localizedShortName_;
    std::optional<std::string> localizedContainingName_;
    std::optional<platform::Dictionary> annotations_;
    std::int64_t lastModified_ = 0;
    std::optional<platform::Uuid> uuid_;
    std::optional<platform::Data> cdhash_;
    std::optional<std::string> requirement_;
};

// "<ZPPlugInCore identifier(version) uuid>", for log lines.
[[nodiscard]] std::string describe(const ZPPlugInCore& plugIn);
