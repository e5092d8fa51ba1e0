#pragma once

#include <optional>
#include <string>
#include <sys/types.h>

namespace platform {

// What a plug-in's process is confined to. A plain value.
struct ConfinementPlan {
    std::string profile;                  // by name
    std::string bundle;                   // it may read and run what lies there
    std::optional<std::string> container; // it may read and write there
    std::optional<uid_t> user;            // as which it runs; nothing: as who launches it
};

} // namespace platform
