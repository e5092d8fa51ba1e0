// What a plug-in record takes over from its extension point (its SDK), and the localized look-up of
// its information dictionary. Runs on the caller's thread.

#include <cassert>
#include <mutex>
#include <unordered_set>
#include <vector>

#include "Zephrin/InfoEntries.h"
#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPExtensionPoints.h"
#include "Zephrin/ZPPlugInCore.h"
#include "platform/paths/Places.h"

using platform::Array;
using platform::Dictionary;
using platform::DictionaryEntry;
using platform::Error;
using platform::Value;

namespace {

constexpr std::int64_t localizationFailed = -1;

// What the records of this process ask: set once, or made with the first question.
struct Source {
    std::mutex mutex;
    std::shared_ptr<const ZPExtensionPoints> points;
};

Source& source() {
    static auto& made = *new Source; // questions may still come while the process ends
    return made;
}

std::shared_ptr<const ZPExtensionPoints> extensionPoints() {
    const std::lock_guard lock(source().mutex);
    if (!source().points) {
        source().points = std::make_shared<ZPExtensionPointFolders>(
            platform::Places::forThisProcess().extensionPointFolders);
    }
    return source().points;
}

// ---- Merging

// A single resource may stand alone, without an array.
Array resourcesOf(const Value& value) {
    return value.array() ? *value.array() : Array{value};
}

// The values of several arrays, each once. Most are texts; those are found by their hash.
class DistinctValues {
public:
    // `values` stays as long as this.
    void add(const Array& values) {
        for (const Value& value : values) {
            if (isNew(value))
                distinct_.push_back(value);
        }
    }

    [[nodiscard]] Array taken() { return Array(std::move(distinct_)); }

private:
    [[nodiscard]] bool isNew(const Value& value) {
        if (const auto text = value.string())
            return texts_.insert(*text).second;
        for (const Value& other : others_) {
            if (other == value)
                return false;
        }
        others_.push_back(value);
        return true;
    }

    std::vector<Value> distinct_;
    std::unordered_set<std::string_view> texts_;
    std::vector<Value> others_;
};

// The value under a key that both have.
Value mergedValue(std::string_view key, const Value& sdk, const Value& plugIn) {
    if (ZPPlugInCore::sdkOverridesKey(key))
        return sdk;
    if (key == InfoKey::shared)
        return ZPPlugInCore::mergeSharedResources(resourcesOf(sdk), resourcesOf(plugIn));
    if (sdk.dictionary() && plugIn.dictionary())
        return ZPPlugInCore::mergeDictionary(*sdk.dictionary(), *plugIn.dictionary());
    return plugIn;
}

// ---- Localized look-up

bool isArchivable(const Value& value) {
    if (value.isNull() || value.encoded())
        return false;
    if (const Array* const items = value.array()) {
        for (const Value& item : *items) {
            if (!isArchivable(item))
                return false;
        }
    }
    if (const Dictionary* const entries = value.dictionary()) {
        for (const DictionaryEntry& item : *entries) {
            if (!isArchivable(item.value))
                return false;
        }
    }
    return true;
}

} // namespace

void ZPPlugInCore::setExtensionPoints(std::shared_ptr<const ZPExtensionPoints> points) {
    const std::lock_guard lock(source().mutex);
    assert(!source().points && "extension points are set before they are asked for");
    source().points = std::move(points);
}

std::optional<Dictionary> ZPPlugInCore::readSDKDictionary(std::string_view identifier) {
    auto found = extensionPoints()->sdkEntry(identifier);
    if (!found)
        ZPDLogOps().standard("plug-in sdk \"%{public}@\" not registered", identifier);
    return found;
}

void ZPPlugInCore::resolveSDK() {
    const auto info = bundleInfoDictionary();
    assert(info && "cannot resolve SDK without materialized Info.plist");
    if (const auto spec = sdkSpec()) {
        const auto identifier = spec->string();
        if (!identifier) {
            ZPDLogOps().error("invalid SDK key:%{public}@", *spec);
            return; // without being canonical
        }
        if (const auto sdk = readSDKDictionary(*identifier))
            mergeSDK(*sdk, info.value_or(Dictionary()));
    }
    canonicalize();
}

void ZPPlugInCore::mergeSDK(const Dictionary& sdk, const Dictionary& info) {
    const Dictionary merged = mergeDictionary(sdk, info);
    setDictionaries(merged);
    if (ZPDLogAr().enabled(platform::log::Level::debug)) {
        ZPDLogAr().debug("%s %@ merged with SDK", "resolveSDK",
                         shown(entry(merged, InfoKey::displayName)));
    }
}

bool ZPPlugInCore::sdkOverridesKey(std::string_view key) {
    return key == InfoKey::cleanTimeout;
}

Dictionary ZPPlugInCore::mergeDictionary(const Dictionary& sdk, const Dictionary& plugIn) {
    std::vector<DictionaryEntry> merged;
    merged.reserve(plugIn.size() + sdk.size());
    for (const DictionaryEntry& own : plugIn) {
        const Value* const given = sdk.find(own.key.view());
        merged.push_back(
            {own.key, given ? mergedValue(own.key.view(), *given, own.value) : own.value});
    }
    for (const DictionaryEntry& given : sdk) {
        if (!plugIn.contains(given.key.view()))
            merged.push_back(given);
    }
    return Dictionary(std::move(merged));
}

Array ZPPlugInCore::mergeSharedResources(const std::optional<Array>& sdk,
                                         const std::optional<Array>& plugIn) {
    DistinctValues merged;
    for (const auto* values : {&plugIn, &sdk}) {
        if (*values)
            merged.add(**values);
    }
    return merged.taken();
}

void ZPPlugInCore::localizedInfoDictionaryForKeys(std::span<const std::string> keys,
                                                  const LocalizedCompletion& completion) const {
    const auto info = bundleInfoDictionary();
    if (!info) {
        completion(std::nullopt,
                   ZPDErrorMakeFormat(localizationFailed, "Unable to resolve plugin for %@",
                                      identifier()));
        return;
    }
    std::optional<Dictionary> result = Dictionary();
    std::optional<Error> failure;
    for (const std::string& key : keys) {
        auto value = localizedValue(key, *info);
        if (!value)
            continue;
        if (!isArchivable(*value)) {
            constexpr const char* refusal = "Value of info dictionary key \"%@\" for plugin %@ "
                                            "does not conform to secure coding!";
            failure = ZPDErrorMakeFormat(localizationFailed, refusal, key, identifier());
            result.reset();
            break;
        }
        result->set(key, std::move(*value));
    }
    if (ZPDLogAr().enabled(platform::log::Level::debug))
        ZPDLogAr().debug("localized values %@", shown(result));
    completion(result, failure);
}

std::optional<Value> ZPPlugInCore::localizedValue(std::string_view key,
                                                  const Dictionary& info) const {
    const auto name = key == InfoKey::name          ? localizedShortName()
                      : key == InfoKey::displayName ? localizedName()
                                                    : std::nullopt;
    if (name)
        return *name;
    auto value = infoKey(key);
    return value ? value : entry(info, key);
}
