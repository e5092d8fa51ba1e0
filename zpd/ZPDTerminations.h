#pragma once

#include <memory>
#include <vector>

#include "AppRegistry/ARZephrinProxy.h"
#include "platform/queue/SerialQueue.h"

namespace platform {
class Jobs;
}

// Forced ends of plug-ins' running processes: each asks the job manager for every plug-in, and goes
// on once all have been answered, whatever the answers are.
//
// Owned by the server; the job manager outlives it. The answers arrive on the queue "killer"; they
// are awaited on "killer-waiter", and there completions run. No thread waits: each answer carries
// the wait on, and the last one ends it. One that is never answered never completes.
class ZPDTerminations {
public:
    using Completion = platform::SerialQueue::Block;

    explicit ZPDTerminations(platform::Jobs& jobs);
    ZPDTerminations(const ZPDTerminations&) = delete;
    ZPDTerminations& operator=(const ZPDTerminations&) = delete;

    ~ZPDTerminations() { close(); }

    // Any thread; nothing may take long.
    void terminate(const std::vector<ARZephrinProxy::Ptr>& plugIns, Completion completion);

    // Lets go of what is not complete: from here on no completion runs. REQUIRES: no queue is held
    void close();

private:
    class Wait;
    using Waits = std::vector<std::shared_ptr<Wait>>;

    void end(const ARZephrinProxy& plugIn, std::shared_ptr<Wait> wait);
    // REQUIRES: on "killer-waiter"
    void answered(const std::shared_ptr<Wait>& wait);
    void goOn(const std::shared_ptr<Wait>& wait);

    platform::Jobs& jobs_;
    const std::shared_ptr<platform::SerialQueue> killer_;
    const std::shared_ptr<platform::SerialQueue> waiter_;
    Waits waits_; // those under way; only on "killer-waiter"
};
