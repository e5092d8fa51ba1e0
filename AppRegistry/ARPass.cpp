#include "AppRegistry/ARPass.h"

#include <algorithm>
#include <fcntl.h>
#include <sys/stat.h>

#include "AppRegistry/ARGrants.h"
#include "platform/ipc/Cbor.h"

namespace {

platform::Date now() {
    const auto since = std::chrono::system_clock::now().time_since_epoch();
    return {std::chrono::duration<double>(since).count()};
}

bool liesBelow(std::string_view path, std::string_view folder) {
    return path.starts_with(folder) && path.substr(folder.size()).starts_with('/');
}

} // namespace

bool ARBatch::declaresTypes() const {
    const auto declares = [](const ARRowPtr& row) { return row->declaresTypes; };
    return std::ranges::any_of(removed, declares) || std::ranges::any_of(added, declares);
}

ARPass::ARPass(const Parts& parts, Apply apply)
    : store_(parts.store),
      model_(parts.model),
      complaints_(parts.complaints),
      grants_(parts.grants),
      watches_(parts.watches),
      apply_(std::move(apply)),
      number_(model_.beginPass()),
      batchBegan_(std::chrono::steady_clock::now()) {}

void ARPass::run(const platform::Places& places, ARDepth depth, const ARKeptPaths::Paths& kept) {
    full_ = true;
    keptAway_.insert(kept.withdrawn.begin(), kept.withdrawn.end());
    watches_.beginFullPass(depth);
    scanner_.scan(places);
    const auto added = model_.pick([&](const ARModel::Entry& entry) {
        return entry.seen != number_ && entry.row->kind == ARKind::plugIn &&
               entry.row->presence == ARPresence::added;
    });
    std::set<std::string> items;
    for (const ARRowPtr& row : added)
        items.emplace(ARItemOf(row->path.view()));
    for (const std::string& item : items)
        lookAtAdded(item);
    presence_ = ARPresence::added;
    for (const std::string& path : kept.added)
        if (!bring(path))
            removeIdleApplication(ARApplicationPathOf(path));
    meetTorn();
    removeUnseen();
    flush();
    complaints_.endPass(number_);
    watches_.endFullPass();
}

void ARPass::look(const std::vector<std::string>& items) {
    watches_.beginPass(ARDepth::everything);
    for (const std::string& item : items) {
        const auto kind = ARKindOfName(ARNameOf(item));
        const std::string folder(ARFolderOf(item));
        if (kind && watches_.isRoot(*kind, folder)) {
            presence_ = ARPresence::found;
            scanner_.scanItem(*kind, folder, std::string(ARNameOf(item)));
        } else {
            lookAtAdded(item);
        }
    }
    flush();
}

void ARPass::lookAtAdded(const std::string& item) {
    presence_ = ARPresence::added;
    const auto added = model_.pickOf(item, [](const ARModel::Entry& entry) {
        return entry.row->kind == ARKind::plugIn && entry.row->presence == ARPresence::added;
    });
    for (int attempt = 0; attempt < ARScanner::mostAttempts; ++attempt) {
        beginItem(item);
        for (const ARRowPtr& row : added)
            bring(std::string(row->path.view()));
        if (endItem())
            return;
    }
}

// ---- Registration by path

std::optional<std::string> ARPass::add(const std::string& path, const platform::Places& places) {
    asked_ = true;
    watches_.beginPass(ARDepth::roots); // a look that follows sets the others
    presence_ = scanner_.reaches(path, places) ? ARPresence::found : ARPresence::added;
    lastRefusal_ = "it is not a plug-in";
    if (bring(path))
        return flushAsked();
    takeBack(0, {});
    return lastRefusal_;
}

bool ARPass::bring(const std::string& path) {
    if (!asked_)
        watches_.watchWay(std::string(ARItemOf(path)), path);
    const std::string application(ARApplicationPathOf(path));
    if (!application.empty() && !meet(ARKind::application, application))
        return false;
    return meet(ARKind::plugIn, path);
}

bool ARPass::meet(ARKind kind, const std::string& path) {
    scanner_.scanBundle(kind, path, std::string(ARItemOf(path)));
    const ARModel::Entry* entry = model_.find(path);
    return entry && entry->seen == number_;
}

std::optional<std::string> ARPass::withdraw(const std::string& path) {
    const ARModel::Entry* entry = model_.find(path);
    if (!entry || entry->row->kind != ARKind::plugIn ||
        entry->row->presence == ARPresence::withdrawn)
        return "not registered";
    if (entry->row->presence == ARPresence::found) {
        ARBundleRow row = *entry->row;
        row.presence = ARPresence::withdrawn;
        replace(std::move(row));
    } else {
        remove(entry->row);
    }
    removeIdleApplication(ARApplicationPathOf(path));
    return flushAsked();
}

std::optional<std::string> ARPass::flushAsked() {
    if (flush())
        return std::nullopt;
    return "it could not be stored";
}

// ---- What the scanner comes upon

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
    if (candidate.kind != ARKind::extensionPoint) {
        if (candidate.path == item_)
            folder_ = *folder;
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

// ---- Changes

ARPresence ARPass::presenceOf(const ARCandidate& candidate, const ARBundleRow* old) {
    if (old && old->presence == ARPresence::found)
        return ARPresence::found; // what the folders lead to stays theirs
    const bool isKeptAway =
        !asked_ && candidate.kind == ARKind::plugIn && !old && keptAway_.contains(candidate.path);
    return isKeptAway ? ARPresence::withdrawn : presence_;
}

void ARPass::enlist(ARBundleContent&& content, const ARCandidate& candidate,
                    const ARBundleRow* old) {
    ARBundleRow& row = content.row;
    row.id = model_.takeId();
    row.uuid = platform::Uuid::random();
    row.registered = now();
    row.presence = presenceOf(candidate, old);
    row.placeholder = row.kind == ARKind::application && files_.isPlaceholder(candidate);
    if (old) {
        row.originalIdentifier = old->originalIdentifier;
        remove(model_.find(candidate.path)->row);
    }
    keepSignature(row.id, content);
    const auto shared = std::make_shared<const ARBundleRow>(std::move(row));
    remember(shared);
    model_.put(shared).seen = number_;
    batch_.pathsChanged |= ARIsRegisteredByPath(*shared);
    batch_.changes.added.push_back({*shared, content.digests, platform::ipc::encode(content.info)});
    batch_.added.push_back(shared);
    batch_.visible = true;
}

void ARPass::refresh(const ARBundleRow& old, const ARCandidate& candidate, const ARStamps& stamps) {
    ARBundleRow row = old;
    row.stamps = stamps;
    if (presence_ == ARPresence::found && row.presence == ARPresence::added)
        row.presence = ARPresence::found;
    row.placeholder = row.kind == ARKind::application && files_.isPlaceholder(candidate);
    replace(std::move(row));
}

void ARPass::keepSignature(std::int64_t id, const ARBundleContent& content) {
    if (auto signature = grants_.judge(content))
        batch_.changes.signatures.push_back({id, std::move(*signature)});
}

// Readers are told only of what they can see: where files' stamps alone moved, they keep the very
// same proxies.
void ARPass::replace(ARBundleRow&& row) {
    const auto shared = std::make_shared<const ARBundleRow>(std::move(row));
    const ARBundleRow& old = *model_.find(shared->path.view())->row;
    const bool visible =
        old.placeholder != shared->placeholder ||
        (old.presence == ARPresence::withdrawn) != (shared->presence == ARPresence::withdrawn);
    batch_.pathsChanged |= old.kind == ARKind::plugIn && old.presence != shared->presence;
    remember(shared);
    model_.put(shared).seen = number_;
    batch_.changes.updated.push_back(*shared);
    if (!visible)
        return;
    batch_.visible = true;
    batch_.updated.push_back(shared);
}

void ARPass::remove(ARRowPtr row) {
    remember(row);
    model_.remove(row->path.view());
    batch_.pathsChanged |= ARIsRegisteredByPath(*row);
    grants_.forget(row->path.view());
    batch_.changes.removed.push_back(row->id);
    batch_.removed.push_back(std::move(row));
    batch_.visible = true;
}

// What no folder led to.
void ARPass::removeUnseen() {
    auto gone = model_.pick([&](const ARModel::Entry& entry) {
        return entry.seen != number_ && !maybeThere(entry.row->path.view());
    });
    const auto itemOf = [](const ARRowPtr& row) { return ARItemOf(row->path.view()); };
    std::ranges::stable_sort(gone, {}, itemOf);
    for (std::size_t i = 0; i < gone.size(); ++i) {
        if (i > 0 && itemOf(gone[i]) != itemOf(gone[i - 1]))
            flushWhenDue();
        remove(gone[i]);
    }
}

// In a pass over everything, bundles that were added by path are looked at later.
void ARPass::removeUnseenOfItem() {
    const auto gone = model_.pickOf(item_, [&](const ARModel::Entry& entry) {
        if (entry.seen == number_)
            return false;
        const bool added = entry.row->presence == ARPresence::added;
        const bool theirs = presence_ == ARPresence::added ? added : !(full_ && added);
        return theirs && !maybeThere(entry.row->path.view());
    });
    for (const ARRowPtr& row : gone)
        remove(row);
}

// An application that no folder leads to is there for its plug-ins.
void ARPass::removeIdleApplication(std::string_view path) {
    const ARModel::Entry* const application = model_.find(path);
    if (!application || application->row->kind != ARKind::application ||
        application->row->presence != ARPresence::added)
        return;
    const auto within = model_.pickOf(path, [](const ARModel::Entry& entry) {
        return entry.row->kind == ARKind::plugIn && entry.row->presence != ARPresence::withdrawn;
    });
    if (within.empty())
        remove(ARRowPtr(application->row));
}

bool ARPass::maybeThere(std::string_view path) const {
    return std::ranges::any_of(unreadable_, [&](const std::string& folder) {
        return path == folder || liesBelow(path, folder);
    });
}

void ARPass::flushWhenDue() {
    if (!asked_ && std::chrono::steady_clock::now() - batchBegan_ >= longestBatch)
        flush();
}

bool ARPass::flush() {
    const bool accepted = batch_.empty() || apply_(std::exchange(batch_, {}));
    if (!accepted)
        takeBack(0, {});
    before_.clear();
    batchBegan_ = std::chrono::steady_clock::now();
    return accepted;
}

void ARPass::remember(const ARRowPtr& coming) {
    const ARModel::Entry* const entry = model_.find(coming->path.view());
    before_.push_back(entry ? Before{entry->row, entry->seen} : Before{coming, 0, true});
}

namespace {

// What grows while a batch is made.
template <class Batch, class Act>
void eachList(Batch& batch, Act&& act) {
    std::size_t number = 0;
    act(number++, batch.changes.added);
    act(number++, batch.changes.updated);
    act(number++, batch.changes.removed);
    act(number++, batch.changes.signatures);
    act(number++, batch.added);
    act(number++, batch.updated);
    act(number++, batch.removed);
}

} // namespace

ARPass::Mark ARPass::mark() const {
    Mark mark{.visible = batch_.visible, .pathsChanged = batch_.pathsChanged};
    eachList(batch_, [&](std::size_t i, const auto& list) { mark.sizes.at(i) = list.size(); });
    return mark;
}

void ARPass::takeBack(std::size_t before, const Mark& mark) {
    for (; before_.size() > before; before_.pop_back()) {
        const Before& last = before_.back();
        if (last.isNew)
            model_.remove(last.row->path.view());
        else
            model_.put(last.row).seen = last.seen;
    }
    eachList(batch_, [&](std::size_t i, auto& list) {
        const auto size = static_cast<std::ptrdiff_t>(std::min(mark.sizes.at(i), list.size()));
        list.erase(list.begin() + size, list.end());
    });
    batch_.visible = mark.visible;
    batch_.pathsChanged = mark.pathsChanged;
}
