#include "zpd/ZPDJobName.h"

#include "AppRegistry/ARZephrinProxy.h"
#include "Zephrin/InfoKeys.h"
#include "zpd/ZPDPlugIn.h"

using platform::Dictionary;
using platform::Value;

namespace {

constexpr std::string_view unversioned = "1";

ZPDJobName nameIn(const std::optional<Dictionary>& info, std::string_view plugIn) {
    const auto text = [&](const char* key, std::string_view otherwise) {
        const Value* const value = info ? info->find(key) : nullptr;
        const auto found = value ? value->string() : std::nullopt;
        return std::string(found.value_or(otherwise));
    };
    return {text(InfoKey::bundleIdentifier, plugIn), text(InfoKey::bundleVersion, unversioned)};
}

} // namespace

ZPDJobName ZPDJobName::of(const ARZephrinProxy& plugIn) {
    return nameIn(plugIn.infoDictionary(), plugIn.plugInIdentifier().value_or(""));
}

ZPDJobName ZPDJobName::of(const ZPDPlugIn& plugIn) {
    return nameIn(plugIn.bundleInfoDictionary(), plugIn.identifier());
}
