#pragma once

#include <chrono>
#include <sched.h>
#include <sys/types.h>

namespace bench {

// Which cores the measured programs run on. What is started afterwards inherits it.
enum class Cores { one, two };

// The cores that this process may use; asked once, before the first pinning.
class CoreChoice {
public:
    CoreChoice();

    // Pins this process: to the last of its cores, or to the last two.
    void pin(Cores cores) const;
    // Moves the calling process to the core that `Cores::one` leaves free (the same where there is
    // only one): for programs that make load and are not measured.
    void stepAside() const;

private:
    cpu_set_t all_;
    int last_ = 0;
    int other_ = 0;
};

// The processor time that all threads of a process have used so far.
[[nodiscard]] std::chrono::nanoseconds processorTime(pid_t pid);

} // namespace bench
