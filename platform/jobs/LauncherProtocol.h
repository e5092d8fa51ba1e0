#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <sys/types.h>
#include <variant>

#include "platform/confine/ConfinementPlan.h"
#include "platform/value/Value.h"

// What the daemon and its launcher tell each other: one-way frames, each a dictionary whose first
// word names it and holds the number of the launch. Both sides check all of it. Pure functions and
// plain values; any thread.
namespace platform::launcher {

using Id = std::uint64_t;

// Daemon to launcher, with two descriptors: the executable, then the socket.
struct Launch {
    Id id = 0;
    std::string path;
    Dictionary environment;
    ConfinementPlan confinement;
};

// Daemon to launcher: SIGTERM, and after the grace time SIGKILL.
struct End {
    Id id = 0;
};

// Launcher to daemon, with a descriptor (pidfd), before the process may become the program: so
// nothing ever runs that the daemon could not end itself.
struct Made {
    Id id = 0;
    pid_t pid = 0; // also of its process group
};

// Launcher to daemon: the program runs.
struct Started {
    Id id = 0;
    Dictionary confinement; // as PreparedConfinement describes it
};

// Launcher to daemon: it does not; nothing is left of it.
struct Failed {
    Id id = 0;
    int error = 0; // errno
    std::string description;
};

// Launcher to daemon: it and all its processes are gone.
struct Gone {
    Id id = 0;
    int status = 0; // as waitpid tells it
};

using Order = std::variant<Launch, End>;
using News = std::variant<Made, Started, Failed, Gone>;

inline constexpr std::size_t launchDescriptors = 2;
inline constexpr std::size_t madeDescriptors = 1;

// Of the program: the number that ZEPHRIN_SOCKET names.
inline constexpr int socketDescriptor = 3;
inline constexpr const char* socketVariable = "ZEPHRIN_SOCKET";

[[nodiscard]] Dictionary encode(const Launch& launch);
[[nodiscard]] Dictionary encode(const End& end);
[[nodiscard]] Dictionary encode(const Made& made);
[[nodiscard]] Dictionary encode(const Started& started);
[[nodiscard]] Dictionary encode(const Failed& failed);
[[nodiscard]] Dictionary encode(const Gone& gone);

// Nothing for what is no such message.
[[nodiscard]] std::optional<Order> decodeOrder(const Dictionary& message);
[[nodiscard]] std::optional<News> decodeNews(const Dictionary& message);

// Whether a process can be given exactly these variables: text to text, without NUL, and names that
// are not empty and hold no "=".
[[nodiscard]] bool isEnvironment(const Dictionary& environment);

} // namespace platform::launcher
