#include "platform/consent/FileConsent.h"

#include "platform/bundle/Bundle.h"
#include "platform/bundle/InfoKeys.h"

namespace platform {

namespace {

std::optional<std::string_view> identifierOf(const BundleReader& bundle) {
    const Dictionary* const info = bundle.infoDictionary();
    const Value* const value = info ? info->find(InfoKey::bundleIdentifier) : nullptr;
    return value ? value->string() : std::nullopt;
}

} // namespace

std::optional<Array>
FileConsent::consentAccessCopyInformationForBundle(const BundleReader& application) {
    const auto identifier = identifierOf(application);
    if (!identifier)
        return std::nullopt;
    const std::lock_guard lock(mutex_);
    file_.refresh();
    const Value* const records = file_.dictionary().find(*identifier);
    if (!records)
        return Array();
    return records->array() ? std::optional(*records->array()) : std::nullopt;
}

} // namespace platform
