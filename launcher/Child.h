#pragma once

#include <cstdint>
#include <expected>
#include <string>
#include <sys/types.h>

#include "platform/confine/PreparedConfinement.h"
#include "platform/file/File.h"
#include "platform/jobs/LauncherProtocol.h"
#include "platform/value/Error.h"

// The making of one process. The launcher forks; the child makes of itself, step by step, what the
// program may be, waits for `letGo`, and becomes the program. What fails on the way comes back
// through a socket that closes with the exec. Functions without state; the launcher's one thread.

// A step of the child's, as it tells of its failure.
enum class ChildStep : std::int32_t {
    descriptors,
    limits,
    user,
    folder,
    confinement,
    execution,
    script, // not executed: an interpreter would have to open the file by itself
    none,   // it was ended before
};

struct ChildFailure {
    ChildStep step;
    std::int32_t error; // errno
};

struct Child {
    pid_t pid = 0;              // leader of the process group of this number
    platform::UniqueFd process; // pidfd
    platform::UniqueFd status;
};

// Every descriptor of the launcher is above those that a child gives new meanings to.
inline constexpr int lowestOwnDescriptor = 6;

// What a launch passed on.
struct Passed {
    platform::UniqueFd executable;
    platform::UniqueFd socket;
};

// `null` is /dev/null, open for reading and writing.
[[nodiscard]] std::expected<Child, platform::Error>
makeChild(const platform::launcher::Launch& launch, const Passed& passed, int null,
          const platform::PreparedConfinement& confinement);

// Until then it does not become the program.
void letGo(int status);

// How a child's beginning went, as far as is known.
enum class ChildOutcome : std::uint8_t { undecided, runs, failed };
[[nodiscard]] ChildOutcome readOutcome(int status, ChildFailure& failure);

// "the step: the reason", for the error that a caller gets.
[[nodiscard]] std::string describe(const ChildFailure& failure);
