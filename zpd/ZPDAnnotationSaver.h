#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <string>

#include "platform/queue/SerialQueue.h"
#include "zpd/ZPDAnnotationStore.h"

// Brings the annotations to disk, so that no request and no look-up waits for a disk: what changed
// in memory is written on the serial queue "annotations" (docs/annotation-store.md).
//
// It asks for what to write only when it begins to write, so that any number of changes that came
// meanwhile are one save, and what did not change is not saved at all. A save that failed is tried
// again with the next change, and for whoever asks for what is in memory already.
//
// Owned by the database, on whose queue the source is asked and which outlives it.
class ZPDAnnotationSaver {
public:
    using Block = platform::SerialQueue::Block;
    // Answers with what there is to be saved now. Called on the queue "annotations".
    using Source = std::function<ZPDAnnotationStore::Snapshot()>;

    // `settled`: the change up to which there is nothing to save.
    ZPDAnnotationSaver(std::string path, std::uint64_t settled, Source source);
    ZPDAnnotationSaver(const ZPDAnnotationSaver&) = delete;
    ZPDAnnotationSaver& operator=(const ZPDAnnotationSaver&) = delete;
    ~ZPDAnnotationSaver(); // closed by then, or closes

    // True when everything up to this change is on disk, or saving it has failed. Any thread.
    [[nodiscard]] bool isSettled(std::uint64_t change) const noexcept {
        return settled_.load(std::memory_order_acquire) >= change;
    }

    // True when everything up to this change is on disk. Any thread.
    [[nodiscard]] bool isSaved(std::uint64_t change) const noexcept {
        return isSettled(change) && !failed_.load(std::memory_order_acquire);
    }

    // Runs `block` on the queue "annotations" once everything up to this change is settled, and
    // saves what is not, or tries to again when no try has ended since it was called. Blocks run
    // in the order in which they came; after `close` none. Any thread.
    void whenSaved(std::uint64_t change, Block block);

    // Waits for the save under way, saves what is left, and saves nothing more.
    // REQUIRES: no queue is held
    void close();

private:
    // REQUIRES: on the queue "annotations"
    void save();

    const std::string path_;
    const Source source_;
    std::atomic<std::uint64_t> settled_;
    std::atomic<std::uint64_t> tries_ = 0;
    std::atomic<bool> failed_ = false; // the last of them
    bool closed_ = false;              // only on the queue
    platform::SerialQueue queue_;      // last: its blocks use all of the above
};
