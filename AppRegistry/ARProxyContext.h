#pragma once

#include <memory>
#include <mutex>

#include "AppRegistry/ARGrants.h"
#include "AppRegistry/ARInfoCache.h"
#include "AppRegistry/ARPlugInUsers.h"

namespace platform {
class Containers;
class Locale;
struct Places;
} // namespace platform

class ARSnapshot;

// What the registry's readers see: the last published snapshot. The lock is held for the copy of
// one pointer. Any thread.
class ARPublished {
public:
    [[nodiscard]] std::shared_ptr<const ARSnapshot> get() const {
        const std::lock_guard lock(lock_);
        return snapshot_;
    }

    void set(std::shared_ptr<const ARSnapshot> snapshot) {
        const std::lock_guard lock(lock_);
        snapshot_.swap(snapshot); // the old one goes without the lock
    }

private:
    mutable std::mutex lock_;
    std::shared_ptr<const ARSnapshot> snapshot_;
};

// What proxies need beyond their row. Shared by the registry and all of its proxies, so that one
// that somebody still holds never reaches for what is gone; the platform services must outlive
// them all. The registry takes the snapshot out when it goes, so that nothing holds itself.
struct ARProxyContext {
    platform::Locale& locale;
    platform::Containers& containers;
    ARInfoCache infos;
    ARGrants grants;
    ARPlugInUsers users;
    ARPublished published;
};
