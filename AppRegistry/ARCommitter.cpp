#include "AppRegistry/ARCommitter.h"

#include <utility>

#include "AppRegistry/ARLog.h"

void ARCommitter::commit(ARStoreChanges&& changes) {
    unwritten_.push_back(std::move(changes));
    static_cast<void>(write(ARDurability::process));
}

std::optional<platform::Error> ARCommitter::commitNow(ARStoreChanges&& changes) {
    unwritten_.push_back(std::move(changes));
    auto error = write(ARDurability::box);
    if (error)
        unwritten_.pop_back();
    return error;
}

void ARCommitter::markComplete() {
    markDue_ = true;
    static_cast<void>(write(ARDurability::process));
}

// Says once that it fails, and once that it works again.
std::optional<platform::Error> ARCommitter::write(ARDurability durability) {
    auto error = unwritten_.empty() ? std::nullopt : store_->commit(unwritten_, durability);
    if (error && !failed_)
        ARLog().error("the registry database cannot be written: %{public}@", *error);
    if (!error && failed_)
        ARLog().standard("the registry database can be written again");
    failed_ = error.has_value();
    if (error)
        return error;
    unwritten_.clear();
    if (markDue_)
        markDue_ = store_->markComplete().has_value();
    return std::nullopt;
}
