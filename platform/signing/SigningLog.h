#pragma once

#include "platform/log/Log.h"

namespace platform {

// The log category of the code-signing service: "signing".
[[nodiscard]] const log::Category& signingLog();

} // namespace platform
