#pragma once

#include <expected>
#include <string>
#include <sys/types.h>
#include <vector>

#include "platform/file/File.h"

namespace zpctl {

class EndingSignals;

// A program that the tool runs in the foreground: it has the terminal, and its end is the tool's. A
// local variable; one thread.
class ChildProgram {
public:
    // Looked for as a shell does. On failure an errno value.
    [[nodiscard]] static std::expected<ChildProgram, int>
    start(const std::vector<std::string>& command, const EndingSignals& signals);

    // Waits for its end; what ends the tool meanwhile is handed on to it. Its exit status, or 128
    // and the number of the signal that ended it, as shells have it.
    [[nodiscard]] int wait(const EndingSignals& signals);

private:
    ChildProgram(pid_t pid, platform::UniqueFd process) : pid_(pid), process_(std::move(process)) {}

    pid_t pid_;
    platform::UniqueFd process_; // pidfd
};

} // namespace zpctl
