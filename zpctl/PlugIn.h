#pragma once

#include <optional>
#include <string>

#include "platform/value/Value.h"

namespace zpctl {

// What people want to know of a plug-in, as text, out of its form. Texts are as the bundle has
// them: not yet printable.
struct PlugIn {
    std::string identifier;
    std::string name; // in the box's language; the identifier when there is none
    std::string version;
    std::string extensionPoint;
    std::string uuid;
    std::string path;
    std::string election; // "elected", "not elected"; empty: the user made no choice
    bool onSystemVolume = false;
    std::optional<std::string> applicationPath;
    std::optional<std::string> applicationName;

    [[nodiscard]] static PlugIn of(const platform::Dictionary& form);
};

// "1 plug-in", "2 plug-ins".
[[nodiscard]] std::string counted(std::size_t count, const std::string& what);

} // namespace zpctl
