#pragma once

#include <chrono>
#include <memory>

#include "platform/ipc/Loop.h"

class ARRegistry;

// When the registry looks at its folders again: shortly after the kernel told of changes, and from
// time to time where it cannot tell. Owned by the daemon; used on the loop alone. The loop must
// outlive it, and so must the registry.
class ARFollower {
public:
    ARFollower(platform::ipc::Loop& loop, ARRegistry& registry);
    ~ARFollower();

    // The second pass, which begins soon, sets the watches that the first one left out.
    void start();

private:
    struct State;

    const std::shared_ptr<State> state_;
};
