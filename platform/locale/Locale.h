#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Value.h"

namespace platform {

// The language and region in use. Localized entries of an info dictionary are keys with a
// suffix, "Key[de_CH]", "Key[de]", looked up in that order before the plain key. Any thread.
class Locale {
public:
    using ChangeHandler = std::function<void()>;

    virtual ~Locale() = default;

    // "ll_CC" or "ll"; empty when none is set (or "C").
    [[nodiscard]] virtual std::string current() = 0;

    // Registers the one observer of changes to the locale file; it is called on the main loop.
    virtual void observeChanges(ChangeHandler handler) = 0;

    // The localized string entry under `key`; nothing when there is none.
    [[nodiscard]] static std::optional<Value>
    localized(const Dictionary& info, std::string_view key, std::string_view locale);
};

} // namespace platform
