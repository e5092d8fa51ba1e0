#include "platform/confine/Profile.h"

#include <algorithm>

#include "platform/confine/PreparedConfinement.h"

namespace platform {

namespace {

constexpr Profile profiles[] = {
    {.name = "plugin", .network = true},
    {.name = "tessary-devtools", .network = true},
    {.name = "keyboard"},
    {.name = "network-filter"},
    {.name = "glanced"},
    {.name = "glance-preview"},
    {.name = "glance-thumbnail"},
    {.name = "message-filter"},
};

} // namespace

std::span<const Profile> allProfiles() {
    return profiles;
}

const Profile* findProfile(std::string_view name) {
    const auto* found = std::ranges::find(profiles, name, &Profile::name);
    return found != std::end(profiles) ? found : nullptr;
}

bool profileMayReachDaemon(std::string_view profile) {
    const Profile* known = findProfile(profile);
    return known && known->reachesDaemon;
}

} // namespace platform
