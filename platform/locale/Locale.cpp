#include "platform/locale/Locale.h"

namespace platform {

namespace {

std::optional<Value> stringUnder(const Dictionary& info, std::string_view key) {
    const Value* found = info.find(key);
    return found && found->string() ? std::optional(*found) : std::nullopt;
}

} // namespace

std::optional<Value> Locale::localized(const Dictionary& info, std::string_view key,
                                       std::string_view locale) {
    const std::string_view language = locale.substr(0, locale.find('_'));
    for (const std::string_view suffix : {locale, language}) {
        if (suffix.empty())
            continue;
        std::string suffixed(key);
        suffixed.append("[").append(suffix).append("]");
        if (auto found = stringUnder(info, suffixed))
            return found;
    }
    return stringUnder(info, key);
}

} // namespace platform
