#pragma once

#include <cstdint>
#include <expected>
#include <functional>
#include <string>
#include <sys/types.h>

#include "platform/confine/ConfinementPlan.h"
#include "platform/file/File.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// Makes processes and ends them, for the job manager. Used on the job manager's loop only; blocks
// are called there, never from within the call that they were given to.
class Launcher {
public:
    struct Launch {
        UniqueFd executable;    // the very file that is run
        UniqueFd socket;        // becomes the process's descriptor that ZEPHRIN_SOCKET names
        std::string path;       // of the executable: the process's first argument
        Dictionary environment; // text to text: exactly this and ZEPHRIN_SOCKET
        ConfinementPlan confinement;
    };

    struct Started {
        pid_t pid = 0;          // also of its process group, which no process of it can leave
        UniqueFd process;       // pidfd
        Dictionary confinement; // "wanted" and "enforced", for people
    };

    using StartedBlock = std::move_only_function<void(std::expected<Started, Error>)>;
    using EndedBlock = std::move_only_function<void()>;
    using Id = std::uint64_t;

    virtual ~Launcher() = default;

    // `started`, once: when the program runs, or why it does not. Only in the first case then
    // `ended`, once: when it and every process that came from it are gone, whoever ended them.
    // Of one that does not run nothing is left by the time that `started` tells so.
    virtual Id launch(Launch launch, StartedBlock started, EndedBlock ended) = 0;

    // Asks it to end, and after a grace time makes it. One that has ended is no error.
    virtual void end(Id id) = 0;
};

} // namespace platform
