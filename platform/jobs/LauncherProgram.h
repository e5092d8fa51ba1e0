#pragma once

#include <expected>
#include <string>
#include <sys/types.h>

#include "platform/file/File.h"
#include "platform/value/Error.h"

namespace platform::launcher {

// A launcher that was just started: a child of this process, in a session of its own.
struct RunningLauncher {
    pid_t pid = 0;    // also of its session
    UniqueFd process; // pidfd
    UniqueFd socket;
};

// Starts the program with one end of a socket as its descriptor 3, and standard error; nothing else
// of this process, of whose environment it gets the log's settings only. Any thread.
[[nodiscard]] std::expected<RunningLauncher, Error> startLauncher(const std::string& program);

// "zpd-launcher" in the folder of this process's own program.
[[nodiscard]] std::string launcherBesideThisProgram();

// The descriptor that a started launcher has its socket as.
inline constexpr int launcherSocket = 3;

} // namespace platform::launcher
