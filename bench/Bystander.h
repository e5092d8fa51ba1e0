#pragma once

#include <functional>
#include <sys/types.h>

#include "bench/Rows.h"

namespace bench {

// A process that makes load beside what is measured, on a core that is left for it where one is.
// Ended when this goes.
class Bystander {
public:
    // `work` runs in the new process, and never returns.
    Bystander(const Run& run, Cores cores, const std::function<void()>& work);
    Bystander(const Bystander&) = delete;
    Bystander& operator=(const Bystander&) = delete;
    ~Bystander();

private:
    pid_t pid_;
};

} // namespace bench
