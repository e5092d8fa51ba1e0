#pragma once

#include "platform/log/Log.h"

// The category "ar": what the registry has to say.
[[nodiscard]] const platform::log::Category& ARLog();
