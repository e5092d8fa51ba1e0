// What a pass makes of what the scanner comes upon: item by item, each bundle kept, read again or
// refused.

#include <fcntl.h>
#include <sys/stat.h>

#include "AppRegistry/ARPass.h"

void ARPass::beginItem(const std::string& item) {
    item_ = item;
    beforeItem_ = before_.size();
    began_ = mark();
    abandoned_ = false;
    folder_.reset();
    refusals_.clear();
    watches_.beginLook(item);
}

bool ARPass::endItem() {
    removeUnseenOfItem();
    removeIdleApplication(item_);
    const bool matters = mark() != began_ || !refusals_.empty();
    const bool torn = !abandoned_ && matters && isTorn();
    const std::string item = std::exchange(item_, {});
    torn_.erase(item);
    if (torn)
        rememberTorn(item);
    if (torn || abandoned_) {
        takeBack(beforeItem_, began_);
        watches_.discardLook(item);
    }
    if (!full_)
        watches_.endLook(item);
    if (torn || abandoned_)
        return abandoned_;
    // One that is still being copied is no trouble yet: it is looked at again.
    if (refusals_.empty() || !watches_.hasChanged(item)) {
        for (const auto& [path, reason] : refusals_)
            complaints_.report(path, reason, number_);
        complaints_.endItem(item, number_);
    }
    flushWhenDue();
    return true;
}

// The item must have been one and the same while it was read. An exchange is told of by its event;
// where that is not out yet, another folder lies there by now.
bool ARPass::isTorn() {
    if (watches_.hasMoved(item_))
        return true;
    struct ::stat status = {};
    return folder_ && (::lstat(item_.c_str(), &status) != 0 || status.st_ino != *folder_);
}

void ARPass::rememberTorn(const std::string& item) {
    std::vector<ARRowPtr>& rows = torn_[item];
    for (std::size_t i = beforeItem_; i < before_.size(); ++i) {
        if (!before_[i].isNew)
            rows.push_back(before_[i].row);
    }
}

// What was there before and after is not gone: it stays as it was known until the look that its
// events bring.
void ARPass::meetTorn() {
    for (const auto& [item, rows] : torn_) {
        for (const ARRowPtr& row : rows) {
            ARModel::Entry* const entry = model_.find(row->path.view());
            if (entry && entry->row == row)
                entry->seen = number_;
        }
    }
}

bool ARPass::found(const ARCandidate& candidate) {
    ARModel::Entry* entry = model_.find(candidate.path);
    if (entry && entry->seen == number_)
        return false; // reached twice
    const auto folder = files_.folderOf(candidate);
    if (!folder) {
        refused(std::string(candidate.path), folder.error());
        return false;
    }
    if (!*folder)
        return false; // moved away just now; the event of that may still be to come
    if (candidate.kind != ARKind::extensionPoint) {
        if (candidate.path == item_)
            folder_ = **folder;
        watches_.watchBundle(candidate.item, candidate.path);
    }
    bool there = true;
    if (entry && unchanged(candidate, *entry->row) && !comesBack(*entry->row)) {
        keep(candidate, *entry);
    } else {
        there = readAgain(candidate, entry ? entry->row.get() : nullptr);
    }
    // Of an application that was added for one plug-in the others stay unknown.
    return there && presence_ == ARPresence::found && !asked_;
}

// Clients can ask for any number of paths: what became of those is not remembered.
void ARPass::refused(const std::string& path, const std::string& reason) {
    lastRefusal_ = reason;
    if (asked_)
        return;
    if (item_.empty())
        complaints_.report(path, reason, number_);
    else
        refusals_.emplace_back(path, reason);
}

// What lies behind a link may be anywhere: only a pass over everything can tell what is gone there.
bool ARPass::foundLink(const std::string& path) {
    watches_.leadsAway(item_.empty() ? path : item_);
    watches_.watchWay(ARWatches::everything, path);
    if (full_)
        return true;
    watches_.markEverything();
    abandoned_ = true;
    return false;
}

void ARPass::unreadable(const std::string& path, const std::string& reason) {
    unreadable_.push_back(path);
    refused(path, reason);
}

// What fails because this process may open no more files says nothing of the bundle.
void ARPass::fault(const std::string& path, const std::string& reason) {
    const platform::UniqueFd probe(::open("/", O_PATH | O_CLOEXEC));
    if (probe)
        return refused(path, reason);
    watches_.lookAgainLater();
    unreadable(path, reason);
}

bool ARPass::comesBack(const ARBundleRow& row) const {
    return asked_ && row.presence == ARPresence::withdrawn;
}

bool ARPass::unchanged(const ARCandidate& candidate, const ARBundleRow& row) const {
    const auto names = ARCountingFileNames(candidate, row.executable.view());
    for (std::size_t file = 0; file < countingFiles; ++file) {
        const auto stamp = files_.stamp(candidate, names[file]);
        if (!stamp || !ARIsSameFile(row.stamps[file], *stamp))
            return false;
    }
    return true;
}

void ARPass::keep(const ARCandidate& candidate, ARModel::Entry& entry) {
    before_.push_back({entry.row, entry.seen});
    entry.seen = number_;
    const bool placeholder =
        candidate.kind == ARKind::application && files_.isPlaceholder(candidate);
    const bool cameUpon =
        presence_ == ARPresence::found && entry.row->presence == ARPresence::added;
    if (placeholder != entry.row->placeholder || cameUpon)
        refresh(*entry.row, candidate, entry.row->stamps);
}

bool ARPass::readAgain(const ARCandidate& candidate, const ARBundleRow* known) {
    ARKnownFiles before;
    if (known) {
        before.stamps = known->stamps;
        before.digests = store_.digests(known->id).value_or(ARDigests{});
    }
    auto content = reader_.read(candidate, before);
    if (!content) {
        fault(std::string(candidate.path), content.error());
        return false;
    }
    complaints_.forget(std::string(candidate.path));
    if (known && !comesBack(*known) &&
        ARHasSameContent(before, {content->row.stamps, content->digests})) {
        keepSignature(known->id, *content);
        refresh(*known, candidate, content->row.stamps); // which may free what was known
        return true;
    }
    enlist(std::move(*content), candidate, known);
    return true;
}
