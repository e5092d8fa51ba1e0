#pragma once

#include <optional>
#include <string>

#include "platform/value/Value.h"

// One extension point as the registry knows it: its identifier and its SDK dictionary, the
// defaults of plug-ins that belong to it. A plain value.
struct ARExtensionPoint {
    std::string identifier;
    std::optional<platform::Dictionary> sdkEntry;
};
