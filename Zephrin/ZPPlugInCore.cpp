#include "Zephrin/ZPPlugInCore.h"

#include <cassert>

#include "Zephrin/Collections.h"
#include "Zephrin/FileURL.h"
#include "Zephrin/InfoEntries.h"
#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"

using platform::Dictionary;
using platform::Error;
using platform::Uuid;
using platform::Value;

namespace {

constexpr std::string_view bundleSuffix = ".appex";
constexpr std::string_view objectSpec = "HXObject";
constexpr std::string_view dataProtocol = "#Data";
constexpr std::string_view noVersion = "<none>";
constexpr std::string_view firstVersion = "1";

bool isText(const std::optional<Value>& value, std::string_view text) {
    return value && value->string() == text;
}

} // namespace

// ---- Making

ZPPlugInCore::Ptr ZPPlugInCore::create(std::optional<std::string> identifier,
                                       std::optional<std::string> path,
                                       const std::optional<Dictionary>& bundleInfo,
                                       const std::optional<Dictionary>& info,
                                       std::optional<Uuid> uuid) {
    auto made = std::make_shared<ZPPlugInCore>();
    if (!made->setup(std::move(identifier), std::move(path), bundleInfo, uuid))
        return nullptr;
    if (!made->plugInDictionary_)
        made->plugInDictionary_ = info;
    return made;
}

bool ZPPlugInCore::setup(std::optional<std::string> identifier, std::optional<std::string> path,
                         const std::optional<Dictionary>& bundleInfo, std::optional<Uuid> uuid) {
    if (!path)
        return false;
    if (!identifier) {
        ZPDLogOps().error("missing identifier in plug-in at %@", *path);
        return false;
    }
    if (bundleInfo) {
        const Dictionary info = normalizeInfoDictionary(*bundleInfo);
        if (!setDictionaries(info)) {
            ZPDLogOps().standard("malformed plug-in dictionary in plug-in %@ at %@: %@",
                                 *identifier, fileURLFromPath(*path), *bundleInfo);
            return false;
        }
        if (ZPDLogAr().enabled(platform::log::Level::debug))
            ZPDLogAr().debug("%s %@", __func__, shown(entry(info, InfoKey::displayName)));
    }
    identifier_ = std::move(*identifier);
    path_ = std::move(*path);
    uuid_ = uuid ? *uuid : Uuid::random();
    return true;
}

Dictionary ZPPlugInCore::normalizeInfoDictionary(const Dictionary& info) const {
    return info;
}

bool ZPPlugInCore::setDictionaries(const Dictionary& info) {
    const auto lock = locked();
    bundleInfoDictionary_ = info;
    if (ZPDLogOps().enabled(platform::log::Level::debug))
        ZPDLogOps().debug("%s %@", __func__, shown(entry(info, InfoKey::displayName)));
    const Value* const extension = info.find(InfoKey::extension);
    if (!extension || !extension->dictionary())
        return false;
    plugInDictionary_ = *extension->dictionary();
    if (plugInDictionary_->contains(InfoKey::multiple)) {
        ZPDLogOps().standard("multiplexed plug-ins (%{public}@ key) obsolete and ignored",
                             InfoKey::multiple);
    }
    return true;
}

void ZPPlugInCore::setPlugInDictionary(std::optional<Dictionary> info) {
    const auto lock = locked();
    plugInDictionary_ = std::move(info);
}

void ZPPlugInCore::canonicalize() {
    const auto lock = locked();
    Dictionary attributes = this->attributes().value_or(Dictionary());
    if (!attribute(InfoKey::version)) {
        const auto bundleVersion = infoKey(InfoKey::shortVersion);
        attributes.set(InfoKey::version, bundleVersion ? *bundleVersion : Value(firstVersion));
    }
    Dictionary canonical = plugInDictionary_.value_or(Dictionary());
    canonical.set(InfoKey::attributes, std::move(attributes));
    plugInDictionary_ = std::move(canonical);
}

// ---- Identity and location

const Uuid& ZPPlugInCore::uuid() const {
    assert(uuid_ && "self.uuid");
    return *uuid_;
}

std::string ZPPlugInCore::url() const {
    return fileURLFromPath(path_);
}

std::optional<std::string> ZPPlugInCore::containingUrl() const {
    return containingPath_.transform([](const std::string& p) { return fileURLFromPath(p); });
}

platform::Date ZPPlugInCore::timestamp() const {
    return {static_cast<double>(lastModified_)};
}

bool ZPPlugInCore::isEqual(const ZPPlugInCore& other) const {
    return uuid() == other.uuid();
}

std::size_t ZPPlugInCore::hash() const {
    return std::hash<Uuid>()(uuid());
}

// ---- Names and annotations

std::optional<std::string> ZPPlugInCore::localizedName() const {
    const auto lock = locked();
    return localizedName_;
}

std::optional<std::string> ZPPlugInCore::localizedShortName() const {
    const auto lock = locked();
    return localizedShortName_;
}

std::optional<std::string> ZPPlugInCore::localizedContainingName() const {
    const auto lock = locked();
    return localizedContainingName_;
}

void ZPPlugInCore::setLocalizedName(std::optional<std::string> name) {
    const auto lock = locked();
    localizedName_ = std::move(name);
}

void ZPPlugInCore::setLocalizedShortName(std::optional<std::string> name) {
    const auto lock = locked();
    localizedShortName_ = std::move(name);
}

void ZPPlugInCore::setLocalizedContainingName(std::optional<std::string> name) {
    const auto lock = locked();
    localizedContainingName_ = std::move(name);
}

std::optional<Dictionary> ZPPlugInCore::annotations() const {
    const auto lock = locked();
    return annotations_;
}

void ZPPlugInCore::setAnnotation(std::string_view key, std::optional<Value> value) {
    const auto lock = locked();
    annotations_ = dictionaryChanging(annotations_, key, std::move(value));
}

// ---- Dictionaries

std::optional<Dictionary> ZPPlugInCore::bundleInfoDictionary() const {
    const auto lock = locked();
    return bundleInfoDictionary_;
}

std::optional<Dictionary> ZPPlugInCore::plugInDictionary() const {
    const auto lock = locked();
    return plugInDictionary_;
}

std::optional<Value> ZPPlugInCore::infoKey(std::string_view key) const {
    auto value = entry(bundleInfoDictionary(), key);
    if (ZPDLogAr().enabled(platform::log::Level::debug))
        ZPDLogAr().debug("%s %@ => %@", __func__, key, shown(value));
    return value;
}

std::optional<Value> ZPPlugInCore::pluginKey(std::string_view key) const {
    return entry(plugInDictionary(), key);
}

std::optional<Value> ZPPlugInCore::attribute(std::string_view key) const {
    return entry(attributes(), key);
}

// ---- Derived

std::optional<Dictionary> ZPPlugInCore::attributes() const {
    const auto found = pluginKey(InfoKey::attributes);
    const Dictionary* const dictionary = found ? found->dictionary() : nullptr;
    return dictionary ? std::optional(*dictionary) : std::nullopt;
}

std::optional<std::string> ZPPlugInCore::version() const {
    const auto found = attribute(InfoKey::version);
    const auto text = found ? found->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

std::string ZPPlugInCore::exportedVersion() const {
    return version().value_or(std::string(noVersion));
}

std::optional<Value> ZPPlugInCore::protocolSpec() const {
    auto spec = pluginKey(InfoKey::protocol);
    return !spec && isAppExtension() ? Value(objectSpec) : spec;
}

std::optional<Value> ZPPlugInCore::principalSpec() const {
    auto spec = pluginKey(InfoKey::principalClass);
    return !spec && isAppExtension() ? Value(objectSpec) : spec;
}

std::optional<Value> ZPPlugInCore::sdkSpec() const {
    return pluginKey(InfoKey::extensionPoint);
}

std::optional<Value> ZPPlugInCore::embeddedProtocolSpec() const {
    auto spec = pluginKey(InfoKey::embeddedProtocol);
    return spec ? spec : protocolSpec();
}

bool ZPPlugInCore::isAppExtension() const {
    return path_.ends_with(bundleSuffix);
}

bool ZPPlugInCore::isHybrid() const {
    return pluginKey(InfoKey::embeddedCode).has_value();
}

bool ZPPlugInCore::isDedicated() const {
    const auto dedicated = pluginKey(InfoKey::dedicated);
    return dedicated && dedicated->booleanValue().value_or(false);
}

bool ZPPlugInCore::isData() const {
    return isText(protocolSpec(), dataProtocol);
}

bool ZPPlugInCore::oldStyle() const {
    if (infoKey(InfoKey::extension))
        return false;
    [[maybe_unused]] const bool old = infoKey(InfoKey::oldStyle).has_value();
    assert(old && "unknown plug-in configuration style");
    return true;
}

// ---- Operations

std::optional<Error> ZPPlugInCore::diagnose() const {
    constexpr std::int64_t code = ZPDErrorCode::badPlugIn;
    constexpr const char* missingKey = "missing \"%@\" key in Info.plist or SDK";
    if (!uuid_) { // the set-up gives both
        return ZPDErrorMake(
            code, "missing identifier (no HXExtensionIdentifier, nor even BQBundleIdentifier)");
    }
    if (!protocolSpec())
        return ZPDErrorMakeFormat(code, missingKey, InfoKey::protocol);
    if (!attributes())
        return ZPDErrorMakeFormat(code, missingKey, InfoKey::attributes);
    if (isAppExtension() && !isText(principalSpec(), objectSpec)) {
        return ZPDErrorMakeFormat(code, "Application Extensions may not use the \"%@\" key",
                                  InfoKey::principalClass);
    }
    if (pluginKey(InfoKey::passProxy)) {
        return ZPDErrorMakeFormat(code, "the \"%@\" key is not supported on this platform",
                                  InfoKey::passProxy);
    }
    if (isHybrid())
        return ZPDErrorMake(code, "hybrid plug-ins are not supported on this platform");
    return std::nullopt;
}

std::optional<Value> ZPPlugInCore::augmentInterface(const Value&) const {
    return std::nullopt;
}

std::string describe(const ZPPlugInCore& plugIn) {
    constexpr std::size_t usualLength = 160;
    std::string text;
    text.reserve(usualLength);
    text.append("<ZPPlugInCore ").append(plugIn.identifier());
    text.append("(").append(plugIn.exportedVersion()).append(") ");
    plugIn.uuid().appendTextTo(text);
    return text.append(">");
}
