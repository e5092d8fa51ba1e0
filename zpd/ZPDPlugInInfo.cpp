#include "zpd/ZPDPlugInInfo.h"

#include "Zephrin/InfoKeys.h"

using platform::Dictionary;
using platform::Value;

namespace {

const Value* entry(const Dictionary* dictionary, std::string_view key) {
    return dictionary ? dictionary->find(key) : nullptr;
}

const Dictionary* dictionaryIn(const Value* value) {
    return value ? value->dictionary() : nullptr;
}

std::optional<std::string> textIn(const Value* value) {
    const auto text = value ? value->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

bool isTrue(const Value* value) {
    return value && value->booleanValue().value_or(false);
}

} // namespace

ZPDPlugInInfo::ZPDPlugInInfo(Dictionary dictionary)
    : dictionary_(std::move(dictionary)),
      plugIn_(dictionaryIn(infoKey(InfoKey::extension))),
      attributes_(dictionaryIn(pluginKey(InfoKey::attributes))),
      hostEntitlement_(pluginKey(InfoKey::hostEntitlement)),
      version_(textIn(attribute(InfoKey::version))),
      isDedicated_(isTrue(pluginKey(InfoKey::dedicated))) {
    if (const Value* const found = entryOf(InfoKey::extensionPoint))
        extensionPoint_ = *found;
}

const Value* ZPDPlugInInfo::infoKey(std::string_view key) const {
    return dictionary_.find(key);
}

const Value* ZPDPlugInInfo::pluginKey(std::string_view key) const {
    return entry(plugIn_, key);
}

const Value* ZPDPlugInInfo::attribute(std::string_view key) const {
    return entry(attributes_, key);
}

const Value* ZPDPlugInInfo::property(std::string_view key) const {
    if (key == InfoKey::extensionPoint)
        return extensionPoint_ ? &*extensionPoint_ : nullptr;
    return entryOf(key);
}

const Value* ZPDPlugInInfo::entryOf(std::string_view key) const {
    const Value* const found = attribute(key);
    return found ? found : infoKey(key);
}
