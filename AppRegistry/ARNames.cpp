#include "AppRegistry/ARNames.h"

#include "AppRegistry/ARProxyContext.h"
#include "platform/locale/Locale.h"

std::optional<std::string> ARLocalizedName(ARProxyContext& context, const ARBundleRow& row,
                                           const char* key) {
    const auto info = context.infos.dictionary(row);
    if (!info)
        return std::nullopt;
    const auto name = platform::Locale::localized(*info, key, context.locale.current());
    const auto text = name ? name->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

std::optional<std::string> ARText(const std::optional<platform::SharedBytes>& text) {
    return text ? std::optional<std::string>(text->view()) : std::nullopt;
}
