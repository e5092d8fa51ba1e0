#include "zpd/ZPDPreparations.h"

#include <chrono>
#include <thread>

bool ZPDPreparations::begin() {
    ++underWay_;
    if (!closed_)
        return true;
    end();
    return false;
}

void ZPDPreparations::end() {
    --underWay_;
}

// Looks again and again: whoever ends the last one must not have to tell, as this may be gone by
// then.
void ZPDPreparations::close() {
    constexpr std::chrono::milliseconds pause{1};
    closed_ = true;
    while (underWay_ != 0)
        std::this_thread::sleep_for(pause);
}
