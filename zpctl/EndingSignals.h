#pragma once

#include <csignal>

#include "platform/file/File.h"

namespace zpctl {

// What waits are ended by: a descriptor that is readable once SIGINT or SIGTERM came. They are held
// back in this thread and in those that it makes, for as long as this lives. A local variable; one
// at a time.
class EndingSignals {
public:
    EndingSignals();
    EndingSignals(const EndingSignals&) = delete;
    EndingSignals& operator=(const EndingSignals&) = delete;
    // Those that came are taken as said: they have ended the wait.
    ~EndingSignals();

    [[nodiscard]] int descriptor() const { return came_.get(); }

    // The one that came first, or 0.
    [[nodiscard]] int take() const;

    // Those that were held back before, for a program that is started meanwhile.
    [[nodiscard]] const ::sigset_t& before() const { return before_; }

private:
    ::sigset_t before_;
    platform::UniqueFd came_;
};

} // namespace zpctl
