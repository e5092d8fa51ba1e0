#include "Zephrin/Collections.h"

using platform::Dictionary;

std::optional<Dictionary> dictionaryChanging(const std::optional<Dictionary>& dictionary,
                                             std::string_view key,
                                             std::optional<platform::Value> value) {
    if (!dictionary)
        return std::nullopt;
    Dictionary changed = *dictionary;
    if (value) {
        changed.set(key, std::move(*value));
    } else {
        changed.remove(key);
    }
    return changed;
}
