#pragma once

#include "platform/log/Log.h"

namespace platform::ipc {

// The log category of the transport: "ipc".
[[nodiscard]] const log::Category& ipcLog();

} // namespace platform::ipc
