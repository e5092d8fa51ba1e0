#include "AppRegistry/ARInfoCache.h"

#include "AppRegistry/ARBundleReader.h"
#include "AppRegistry/ARStore.h"
#include "platform/ipc/Cbor.h"

using platform::Dictionary;

std::optional<Dictionary> ARInfoCache::dictionary(const ARBundleRow& row) {
    if (auto known = recall(row.id))
        return known;
    auto info = fetch(row);
    if (info) {
        const std::lock_guard lock(lock_);
        slots_[next_++ % remembered] = {row.id, *info};
    }
    return info;
}

void ARInfoCache::clear() {
    const std::lock_guard lock(lock_);
    slots_.fill({});
}

std::optional<Dictionary> ARInfoCache::recall(std::int64_t id) {
    const std::lock_guard lock(lock_);
    for (const Slot& slot : slots_) {
        if (slot.id == id)
            return slot.info;
    }
    return std::nullopt;
}

std::optional<Dictionary> ARInfoCache::fetch(const ARBundleRow& row) {
    if (const auto stored = store_->info(row.id)) {
        const std::lock_guard lock(keysLock_);
        const auto decoded = platform::ipc::decode(*stored, {.keys = &keys_});
        if (decoded && decoded->dictionary())
            return *decoded->dictionary();
    }
    return ARReadReportedInfo(row);
}
