#pragma once

#include <span>
#include <string_view>

namespace platform {

// A kind of confinement, by name: what it allows beyond what all plug-ins may. docs/sandbox.md
// tells of each.
struct Profile {
    std::string_view name;
    bool network = false;       // TCP and UDP
    bool reachesDaemon = false; // may connect to the daemon's own services
};

[[nodiscard]] std::span<const Profile> allProfiles();
// Null for an unknown name.
[[nodiscard]] const Profile* findProfile(std::string_view name);

} // namespace platform
