#pragma once

#include <chrono>
#include <sched.h>
#include <sys/types.h>

namespace bench {

// How the measured programs lie on the cores: client and server on the same, or each on its own.
// Left to itself the scheduler chooses between the two by chance, and between the daemon and the
// floor differently.
enum class Cores { one, two };

// The cores that this process may use; asked once, before the first pinning.
class CoreChoice {
public:
    CoreChoice();

    // Pins the calling process to the core of the servers, the last of its cores. What it starts
    // from then on inherits that.
    void asServer() const;
    // Pins it to the core of the client.
    void asClient(Cores cores) const;
    // Whether a core is left beside those of servers and client.
    [[nodiscard]] bool leavesOne(Cores cores) const;
    // Pins it to the core that is left: for programs that make load and are not measured.
    void asBystander(Cores cores) const;
    // Lets it, and what it starts, use both: for programs that are measured alone.
    void asBoth() const;

private:
    int last_ = 0;
    int other_ = 0;
    int third_ = 0;
};

// The processor time that all threads of a process have used so far.
[[nodiscard]] std::chrono::nanoseconds processorTime(pid_t pid);

} // namespace bench
