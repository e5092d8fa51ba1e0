#include "zpd/ZPDPlugIn.h"

#include "AppRegistry/ARApplicationWorkspace.h"
#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "zpd/Entitlements.h"
#include "zpd/ZPDKeyPool.h"
#include "zpd/ZPDPlugInInfo.h"

using platform::Dictionary;
using platform::Error;
using platform::Uuid;
using platform::Value;

namespace {

constexpr std::uint64_t oldStyleHubVersion = 1;
constexpr std::uint64_t currentHubVersion = 2;
constexpr std::string_view systemFolder = "/System/";
constexpr std::string_view developmentKeyPrefix = "DT";

std::uint64_t unsignedValue(const Value& value) {
    return value.unsignedInteger().value_or(
        static_cast<std::uint64_t>(value.integerValue().value_or(0)));
}

std::uint64_t hubProtocolVersionOf(const std::optional<Dictionary>& plugIn,
                                   const std::optional<Dictionary>& info) {
    const Value* const said = plugIn ? plugIn->find(InfoKey::hubProtocolVersion) : nullptr;
    if (said)
        return unsignedValue(*said);
    return info && info->contains(InfoKey::oldStyle) ? oldStyleHubVersion : currentHubVersion;
}

std::int64_t wholeSeconds(platform::Date date) {
    return Value(date.secondsSinceEpoch).integerValue().value_or(0);
}

// The plug-in dictionary, as the very object within the information dictionary where they are
// equal: there are many records, and none should hold it twice.
std::optional<Dictionary> sharedWith(const std::optional<Dictionary>& info,
                                     std::optional<Dictionary> plugIn) {
    const Value* const within = info ? info->find(InfoKey::extension) : nullptr;
    if (plugIn && within && within->dictionary() && *within->dictionary() == *plugIn)
        return *within->dictionary();
    return plugIn;
}

std::optional<Value> copied(const Value* value) {
    return value ? std::optional(*value) : std::nullopt;
}

} // namespace

// ---- Making

ZPDPlugIn::Ptr ZPDPlugIn::create(const ARZephrinProxy::Ptr& proxy,
                                 const ZPDPlugInContext& context) {
    Ptr made(new ZPDPlugIn(context));
    if (!made->setupWithProxy(proxy))
        return nullptr;
    if (const auto fault = made->diagnose()) {
        ZPDLogAr().info("ignoring mis-configured plug-in at %@: %{public}@", made->path(),
                        fault->description.value_or(""));
        return nullptr;
    }
    return made;
}

bool ZPDPlugIn::setupWithProxy(const ARZephrinProxy::Ptr& proxy) {
    if (!setup(proxy->plugInIdentifier(), proxy->bundlePath(), std::nullopt, proxy->plugInUUID()))
        return false;
    identifierHash_ = std::hash<std::string>()(identifier());
    setInfo(proxy->infoDictionary());
    known_ = proxy;
    const auto info = infoPlist();
    const auto plugInInfo = sharedWith(info, proxy->plugInDictionary());
    setPlugInDictionary(plugInInfo);
    setLastModified(wholeSeconds(proxy->registrationDate()));
    setOnSystemVolume(proxy->isOnSystemPartition());

    const auto containing = proxy->containingBundle();
    setLocalizedName(proxy->localizedName());
    setLocalizedShortName(proxy->localizedShortName());
    setLocalizedContainingName(containing ? containing->localizedName() : std::nullopt);

    setOriginalIdentifier(proxy->originalIdentifier());
    setEntitlements(proxy->entitlements());
    dataContainerPath_ = proxy->dataContainerPath();
    userIdentifier_ = proxy->userIdentifier();
    setHubProtocolVersion(hubProtocolVersionOf(plugInInfo, info));
    setContainingPath(containing ? std::optional(containing->bundlePath()) : std::nullopt);
    return true;
}

// ---- Following the registry

ARZephrinProxy::Ptr ZPDPlugIn::getProxy() const {
    auto proxy = context_.workspace.zephrinProxyForUUID(uuid());
    if (proxy)
        return proxy;
    ZPDLogAr().standard("Failed to find Plugin by %{uuid_t}.16P fallback to path %@", uuid(),
                        url());
    return context_.workspace.zephrinProxyForPath(path());
}

std::optional<Uuid> ZPDPlugIn::arKnowledgeUUID() const {
    const auto lock = locked();
    return arKnowledgeUUID_;
}

std::optional<Dictionary> ZPDPlugIn::infoPlist() const {
    const auto lock = locked();
    return info_ ? std::optional(info_->dictionary()) : std::nullopt;
}

std::shared_ptr<const ZPDPlugInInfo> ZPDPlugIn::currentInfo() const {
    const auto lock = locked();
    follow();
    return info_;
}

void ZPDPlugIn::follow() const {
    const std::uint64_t sequence = context_.workspace.knowledgeSequence();
    if (sequence != 0 && sequence == knowledgeSequence_)
        return;
    const auto knowledge = context_.workspace.knowledge().uuid;
    if (!knowledge || knowledge != arKnowledgeUUID_)
        refresh(knowledge);
    knowledgeSequence_ = sequence;
}

void ZPDPlugIn::refresh(const std::optional<Uuid>& knowledge) const {
    if (const auto proxy = getProxy()) {
        takeInfo(proxy);
    } else {
        ZPDLogAr().error("could not obtain fresh proxy for %@", uuid());
        known_.reset();
        setInfo(std::nullopt);
    }
    arKnowledgeUUID_ = knowledge;
}

// Most moves of the registry concern other plug-ins: then the very same entry, or an equal
// dictionary, comes back, and nothing that was derived from it is thrown away.
void ZPDPlugIn::takeInfo(const ARZephrinProxy::Ptr& proxy) const {
    if (info_ && known_.lock() == proxy)
        return;
    const auto fresh = proxy->infoDictionary();
    known_ = proxy;
    if (!info_ || !fresh || info_->dictionary() != *fresh)
        setInfo(fresh);
}

void ZPDPlugIn::setInfo(const std::optional<Dictionary>& info) const {
    info_.reset();
    if (info)
        info_ = std::make_shared<const ZPDPlugInInfo>(context_.keys.withSharedKeys(*info));
    forgetForm();
}

std::optional<Dictionary> ZPDPlugIn::bundleInfoDictionary() const {
    const auto info = currentInfo();
    return info ? std::optional(info->dictionary()) : std::nullopt;
}

std::optional<Value> ZPDPlugIn::infoKey(std::string_view key) const {
    const auto info = currentInfo();
    return info ? copied(info->infoKey(key)) : std::nullopt;
}

std::optional<Value> ZPDPlugIn::pluginKey(std::string_view key) const {
    const auto info = currentInfo();
    return info ? copied(info->pluginKey(key)) : std::nullopt;
}

std::optional<Value> ZPDPlugIn::attribute(std::string_view key) const {
    const auto info = currentInfo();
    return info ? copied(info->attribute(key)) : std::nullopt;
}

std::optional<std::string> ZPDPlugIn::version() const {
    const auto info = currentInfo();
    return info ? info->version() : std::nullopt;
}

bool ZPDPlugIn::isDedicated() const {
    const auto info = currentInfo();
    return info && info->isDedicated();
}

Dictionary ZPDPlugIn::prunedInfoDictionaryFor(const std::optional<Dictionary>& info) {
    std::vector<platform::DictionaryEntry> kept;
    for (const auto& item : info.value_or(Dictionary())) {
        if (!item.key.view().starts_with(developmentKeyPrefix))
            kept.push_back(item);
    }
    return Dictionary(std::move(kept));
}

// ---- Entitlements

std::optional<Value> ZPDPlugIn::valueForEntitlement(std::string_view key) const {
    const auto& held = entitlements();
    return held ? copied(held->find(key)) : std::nullopt;
}

bool ZPDPlugIn::hasEntitlement(std::string_view key) const {
    const auto value = valueForEntitlement(key);
    return value && !value->equalsFalse();
}

std::string_view ZPDPlugIn::annotationKey() const {
    const auto& held = entitlements();
    const Value* const replaced = held ? held->find(Entitlement::replacePlugIn) : nullptr;
    const auto text = replaced ? replaced->string() : std::nullopt;
    return text.value_or(identifier());
}

// ---- Check

std::optional<Error> ZPDPlugIn::diagnose() const {
    if (auto fault = ZPPlugInCore::diagnose())
        return fault;
    if (!isData() && !dataContainerPath_) {
        return ZPDErrorMake(ZPDErrorCode::badPlugIn, "this plug-in has no sandbox data container");
    }
    if (!containingPath() && !path().starts_with(systemFolder)) {
        return ZPDErrorMake(ZPDErrorCode::badPlugIn,
                            "plug-ins outside containing apps must be in /System");
    }
    return std::nullopt;
}
