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
    queue_.async([this, change, triesBefore = tries_.load(), block = std::move(block)]() mutable {
        if (closed_)
            return;
        if (!isSettled(change) || triesBefore == tries_)
            save();
        block();
    });
}

void ZPDAnnotationSaver::close() {
    queue_.sync([this] {
        if (!std::exchange(closed_, true))
            save();
    });
}

void ZPDAnnotationSaver::save() {
    queue_.assertOnQueue();
    const ZPDAnnotationStore::Snapshot newest = source_();
    if (isSaved(newest.change))
        return;
    const auto failure = ZPDAnnotationStore::saveDb(path_, newest.annotations);
    if (failure) {
        ZPDLogOps().error("unable to save annotations:%{public}@ error:%{public}@",
                          fileURLFromPath(path_), *failure);
    }
    failed_ = failure.has_value();
    settled_.store(newest.change, std::memory_order_release);
    ++tries_;
}
