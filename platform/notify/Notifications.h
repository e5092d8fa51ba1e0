#pragma once

#include <string_view>

namespace platform {

// System-wide notifications without payload: posting bumps a counter file of that name, which
// observers watch. Any thread.
class Notifications {
public:
    virtual ~Notifications() = default;
    virtual void post(std::string_view name) = 0;
};

} // namespace platform
