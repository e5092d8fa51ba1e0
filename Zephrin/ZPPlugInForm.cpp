// The form of a plug-in record: the flat dictionary as which it crosses between daemon and client.

#include <cassert>

#include "Zephrin/InfoEntries.h"
#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPPlugInCore.h"

using platform::Dictionary;
using platform::Value;

namespace {

constexpr std::uint64_t unsaidHubProtocolVersion = 1;

std::optional<std::string> textEntry(const Dictionary& form, std::string_view key) {
    const Value* const value = form.find(key);
    const auto text = value ? value->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

std::optional<Dictionary> dictionaryEntry(const Dictionary& form, std::string_view key) {
    const Dictionary* const found = form.findDictionary(key);
    return found ? std::optional(*found) : std::nullopt;
}

std::optional<platform::Uuid> uuidEntry(const Dictionary& form) {
    const auto text = textEntry(form, FormKey::uuid);
    return text ? platform::Uuid::parse(*text) : std::nullopt;
}

std::uint64_t hubProtocolVersionIn(const Dictionary& form) {
    const Value* const value = form.find(FormKey::hubProtocolVersion);
    if (!value)
        return unsaidHubProtocolVersion;
    return value->unsignedInteger().value_or(
        static_cast<std::uint64_t>(value->integerValue().value_or(0)));
}

void addText(Dictionary& form, std::string_view key, const std::optional<std::string>& text) {
    if (text)
        form.set(key, *text);
}

void logDisplayName(const char* format, const char* operation, const Dictionary& bundleInfo) {
    if (ZPDLogAr().enabled(platform::log::Level::debug))
        ZPDLogAr().debug(format, operation, shown(entry(bundleInfo, InfoKey::displayName)));
}

} // namespace

ZPPlugInCore::Ptr ZPPlugInCore::createWithForm(const Dictionary& form) {
    auto made = std::make_shared<ZPPlugInCore>();
    return made->setupWithForm(form) ? made : nullptr;
}

bool ZPPlugInCore::setupWithForm(const Dictionary& form) {
    if (!setup(textEntry(form, FormKey::identifier), textEntry(form, FormKey::path),
               dictionaryEntry(form, FormKey::bundleInfo), uuidEntry(form)))
        return false;
    hubProtocolVersion_ = hubProtocolVersionIn(form);
    originalIdentifier_ = textEntry(form, FormKey::originalIdentifier);
    const Value* const hash = form.find(FormKey::hash);
    cdhash_ = hash && hash->data() ? std::optional(*hash->data()) : std::nullopt;
    requirement_ = textEntry(form, FormKey::requirement);
    const Value* const modified = form.find(FormKey::lastModified);
    lastModified_ = modified ? modified->integerValue().value_or(0) : 0;
    entitlements_ = dictionaryEntry(form, FormKey::entitlements);
    if (auto containing = textEntry(form, FormKey::containingPath))
        containingPath_ = std::move(containing);
    const Value* const resident = form.find(FormKey::systemResident);
    onSystemVolume_ = resident && resident->booleanValue().value_or(false);
    annotations_ = dictionaryEntry(form, FormKey::annotations);
    localizedName_ = textEntry(form, FormKey::displayName);
    localizedShortName_ = textEntry(form, FormKey::shortName);
    localizedContainingName_ = textEntry(form, FormKey::containingName);
    return true;
}

void ZPPlugInCore::updateFromForm(const Dictionary& form) {
    const auto lock = locked();
    annotations_ = dictionaryEntry(form, FormKey::annotations);
}

std::expected<Dictionary, platform::Error> ZPPlugInCore::exportForm() const {
    const auto bundleInfo = bundleInfoDictionary();
    const auto info = plugInDictionary();
    assert(bundleInfo && info);
    return formOf(bundleInfo.value_or(Dictionary()), info.value_or(Dictionary()));
}

Dictionary ZPPlugInCore::formOf(const Dictionary& bundleInfo, const Dictionary& info) const {
    assert(originalIdentifier_ && uuid_);
    Dictionary shownInfo = bundleInfo;
    shownInfo.remove(InfoKey::plistUrl);
    Dictionary form{
        {FormKey::hubProtocolVersion, hubProtocolVersion_},
        {FormKey::path, path_},
        {FormKey::systemResident, onSystemVolume_},
        {FormKey::identifier, identifier_},
        {FormKey::originalIdentifier, originalIdentifier_.value_or(identifier_)},
        {FormKey::version, exportedVersion()},
        {FormKey::info, info},
        {FormKey::uuid, uuid().text()},
        {FormKey::lastModified, lastModified_},
        {FormKey::annotations, annotations().value_or(Dictionary())},
    };
    if (entitlements_)
        form.set(FormKey::entitlements, *entitlements_);
    addText(form, FormKey::containingPath, containingPath_);
    addNames(form, shownInfo);
    form.set(FormKey::bundleInfo, std::move(shownInfo));
    return form;
}

void ZPPlugInCore::addNames(Dictionary& form, Dictionary& bundleInfo) const {
    const auto lock = locked();
    addText(form, FormKey::containingName, localizedContainingName_);
    if (localizedName_) {
        addText(form, FormKey::displayName, localizedName_);
        logDisplayName("%s BundleInfo[BundleDisplayName] was %@", __func__, bundleInfo);
        bundleInfo.set(InfoKey::displayName, *localizedName_);
        logDisplayName("%s BundleInfo[BundleDisplayName] is %@", __func__, bundleInfo);
    }
    addText(form, FormKey::shortName, localizedShortName_);
}
