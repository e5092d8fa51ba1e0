#pragma once

#include "platform/log/Log.h"

namespace platform {

// The log category of the sandbox service: "sandbox".
[[nodiscard]] const log::Category& sandboxLog();

} // namespace platform
