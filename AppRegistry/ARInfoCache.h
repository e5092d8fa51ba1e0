#pragma once

#include <array>
#include <cstddef>
#include <memory>
#include <mutex>
#include <optional>

#include "AppRegistry/ARModel.h"
#include "platform/value/TextPool.h"
#include "platform/value/Value.h"

class ARStore;

// Info dictionaries of entries, decoded when asked for. Only the last few are remembered, so that
// the steps that build one record decode once; who needs one for longer keeps it. What the
// database cannot tell is read from the bundle. Any thread.
class ARInfoCache {
public:
    explicit ARInfoCache(std::shared_ptr<const ARStore> store) : store_(std::move(store)) {}

    [[nodiscard]] std::optional<platform::Dictionary> dictionary(const ARBundleRow& row);
    void clear();

private:
    static constexpr std::size_t remembered = 8;

    struct Slot {
        std::int64_t id = 0;
        platform::Dictionary info;
    };

    [[nodiscard]] std::optional<platform::Dictionary> recall(std::int64_t id);
    [[nodiscard]] std::optional<platform::Dictionary> fetch(const ARBundleRow& row);

    std::shared_ptr<const ARStore> store_;
    std::mutex keysLock_;     // held while decoding
    platform::TextPool keys_; // the keys of all dictionaries, which are much alike
    std::mutex lock_;         // held for a look or a change
    std::array<Slot, remembered> slots_;
    std::size_t next_ = 0;
};
