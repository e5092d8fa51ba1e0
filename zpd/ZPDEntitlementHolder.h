#pragma once

#include <optional>
#include <string_view>

#include "platform/value/Value.h"

// Whoever carries entitlements: a connected client, asked whether it may see or use a plug-in.
class ZPDEntitlementHolder {
public:
    virtual ~ZPDEntitlementHolder() = default;
    [[nodiscard]] virtual std::optional<platform::Value>
    entitlementValueForKey(std::string_view key) = 0;
    // True when there is a value and it does not equal false.
    [[nodiscard]] virtual bool hasEntitlement(std::string_view key) = 0;
};
