#pragma once

#include "platform/log/Log.h"

namespace platform {

// The log category of the job manager: "jobs".
[[nodiscard]] const log::Category& jobLog();

} // namespace platform
