#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "AppRegistry/ARStore.h"

// Brings the registry's changes into its database, in the order in which they came. What cannot be
// written (the disk is full) is kept and written together with the next change. Owned by the
// registry, used on its queue.
class ARCommitter {
public:
    explicit ARCommitter(std::shared_ptr<ARStore> store) : store_(std::move(store)) {}

    // Writes a change now or later. The folders can tell it again should the process end before.
    void commit(ARStoreChanges&& changes);
    // Writes and syncs a change, and all that is left from before; on failure nothing of it.
    [[nodiscard]] std::optional<platform::Error> commitNow(ARStoreChanges&& changes);
    // Tells the database once that it is complete, which it is not while something is left.
    void markComplete();

private:
    [[nodiscard]] std::optional<platform::Error> write(ARDurability durability);

    const std::shared_ptr<ARStore> store_;
    std::vector<ARStoreChanges> unwritten_;
    bool failed_ = false; // the last time
    bool markDue_ = false;
};
