#include "zpd/ZPDAnnotationSaver.h"

#include <utility>

#include "Zephrin/FileURL.h"
#include "Zephrin/ZPDLog.h"

ZPDAnnotationSaver::ZPDAnnotationSaver(std::string path, std::uint64_t settled, Source source)
    : path_(std::move(path)),
      source_(std::move(source)),
      settled_(settled),
      queue_("annotations", platform::QueueRank::service) {}

ZPDAnnotationSaver::~ZPDAnnotationSaver() {
    close();
}

void ZPDAnnotationSaver::whenSaved(std::uint64_t change, Block block) {
    queue_.async([this, change, block = std::move(block)]() mutable {
        if (closed_)
            return;
        if (!isSettled(change))
            save();
        block();
    });
}

void ZPDAnnotationSaver::close() {
    queue_.sync([this] {
        if (std::exchange(closed_, true))
            return;
        if (failed_)
            settled_ = 0; // the last chance
        save();
    });
}

void ZPDAnnotationSaver::save() {
    queue_.assertOnQueue();
    const ZPDAnnotationStore::Snapshot newest = source_();
    if (isSettled(newest.change))
        return;
    const auto failure = ZPDAnnotationStore::saveDb(path_, newest.annotations);
    failed_ = failure.has_value();
    if (failure) {
        ZPDLogOps().error("unable to save annotations:%{public}@ error:%{public}@",
                          fileURLFromPath(path_), *failure);
    }
    settled_.store(newest.change, std::memory_order_release);
}
