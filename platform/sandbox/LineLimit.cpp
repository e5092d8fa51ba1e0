#include "platform/sandbox/LineLimit.h"

namespace platform {

bool LineLimit::take() {
    const auto now = Clock::now();
    if (now - since_ >= whileOf) {
        since_ = now;
        lines_ = 0;
    }
    if (lines_ == mostLines) {
        ++untold_;
        return false;
    }
    ++lines_;
    return true;
}

} // namespace platform
