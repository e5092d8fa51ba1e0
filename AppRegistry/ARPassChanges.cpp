// What a pass changes: in the model at once, and in the batch that it hands on.

#include <algorithm>

#include "AppRegistry/ARGrants.h"
#include "AppRegistry/ARPass.h"
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
