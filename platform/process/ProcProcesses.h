#pragma once

#include "platform/process/Processes.h"

namespace platform {

// Other processes as /proc tells of them. No state; any thread.
class ProcProcesses final : public Processes {
public:
    [[nodiscard]] std::expected<std::string, int> executablePath(const ipc::Peer& peer,
                                                                 std::size_t room) override;
};

} // namespace platform
