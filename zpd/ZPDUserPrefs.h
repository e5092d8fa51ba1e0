#pragma once

#include <optional>
#include <string_view>

#include "platform/preferences/Preferences.h"
#include "platform/value/Value.h"

// The user's preferences about plug-ins. Owned by the server; the preferences service must outlive
// it. On the service queue.
class ZPDUserPrefs {
public:
    static constexpr std::string_view domain = "com.tovana.zephrin.userprefs";

    explicit ZPDUserPrefs(platform::Preferences& preferences) : preferences_(preferences) {}

    // The rules of plug-ins that no host shall see, as they are stored now; nothing when none are.
    [[nodiscard]] std::optional<platform::Value> exclusions();

private:
    platform::Preferences& preferences_;
};
