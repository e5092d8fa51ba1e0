#include "AppRegistry/ARPass.h"

#include <algorithm>
#include <cmath>

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

ARPass::ARPass(ARStore& store, ARModel& model, ARComplaints& complaints, ARGrants& grants,
               Apply apply)
    : store_(store),
      model_(model),
      complaints_(complaints),
      grants_(grants),
      apply_(std::move(apply)),
      number_(model.beginPass()),
      batchBegan_(std::chrono::steady_clock::now()) {}

void ARPass::run(const platform::Places& places, const ARKeptPaths::Paths& kept) {
    keptAway_.insert(kept.withdrawn.begin(), kept.withdrawn.end());
    scanner_.scan(places);
    presence_ = ARPresence::added;
    const auto elsewhere = model_.pick([&](const ARModel::Entry& entry) {
        return entry.seen != number_ && entry.row->kind == ARKind::plugIn &&
               entry.row->presence == ARPresence::added;
    });
    for (const ARRowPtr& row : elsewhere)
        bring(std::string(row->path.view()));
    for (const std::string& path : kept.added)
        bring(path);
    removeUnseen();
    removeIdleApplications();
    flush();
}

// ---- Registration by path

std::optional<std::string> ARPass::add(const std::string& path, const platform::Places& places) {
    asked_ = true;
    presence_ = scanner_.reaches(path, places) ? ARPresence::found : ARPresence::added;
    lastRefusal_ = "it is not a plug-in";
    if (bring(path))
        return flushAsked();
    batch_ = {};
    takeBack();
    return lastRefusal_;
}

bool ARPass::bring(const std::string& path) {
    const std::string application(ARApplicationPathOf(path));
    if (!application.empty() && !meet(ARKind::application, application))
        return false;
    return meet(ARKind::plugIn, path);
}

bool ARPass::meet(ARKind kind, const std::string& path) {
    scanner_.scanBundle(kind, path);
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
    removeIdleApplications();
    return flushAsked();
}

std::optional<std::string> ARPass::flushAsked() {
    if (flush())
        return std::nullopt;
    return "it could not be stored";
}

// ---- What the scanner comes upon

bool ARPass::found(const ARCandidate& candidate) {
    ARModel::Entry* entry = model_.find(candidate.path);
    if (entry && entry->seen == number_)
        return false; // reached twice
    if (const auto refusal = files_.refusal(candidate)) {
        refused(std::string(candidate.path), *refusal);
        return false;
    }
    bool there = true;
    if (entry && unchanged(candidate, *entry->row) && !comesBack(*entry->row)) {
        keep(candidate, *entry);
    } else {
        there = readAgain(candidate, entry ? entry->row.get() : nullptr);
    }
    flushWhenDue();
    // Of an application that was added for one plug-in the others stay unknown.
    return there && presence_ == ARPresence::found && !asked_;
}

// Clients can ask for any number of paths: what became of those is not remembered.
void ARPass::refused(const std::string& path, const std::string& reason) {
    lastRefusal_ = reason;
    if (!asked_)
        complaints_.report(path, reason);
}

void ARPass::unreadable(const std::string& path, const std::string& reason) {
    unreadable_.push_back(path);
    refused(path, reason);
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
        refused(std::string(candidate.path), content.error());
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
    const bool isKeptAway = !asked_ && candidate.kind == ARKind::plugIn && !old &&
                            keptAway_.erase(std::string(candidate.path)) > 0;
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
    remember(shared->path.view());
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
    remember(shared->path.view());
    model_.put(shared).seen = number_;
    batch_.changes.updated.push_back(*shared);
    if (!visible)
        return;
    batch_.visible = true;
    batch_.updated.push_back(shared);
}

void ARPass::remove(ARRowPtr row) {
    remember(row->path.view());
    model_.remove(row->path.view());
    batch_.pathsChanged |= ARIsRegisteredByPath(*row);
    grants_.forget(row->path.view());
    batch_.changes.removed.push_back(row->id);
    batch_.removed.push_back(std::move(row));
    batch_.visible = true;
}

void ARPass::removeUnseen() {
    const auto gone = model_.pick([&](const ARModel::Entry& entry) {
        return entry.seen != number_ && !maybeThere(entry.row->path.view());
    });
    for (const ARRowPtr& row : gone) {
        remove(row);
        flushWhenDue();
    }
}

// An application that no folder leads to is there for its plug-ins.
void ARPass::removeIdleApplications() {
    const auto added = model_.pick([](const ARModel::Entry& entry) {
        return entry.row->kind == ARKind::application && entry.row->presence == ARPresence::added;
    });
    for (const ARRowPtr& row : added) {
        if (!hasPlugIns(row->path.view()))
            remove(row);
    }
}

bool ARPass::hasPlugIns(std::string_view application) const {
    const auto within = model_.pick([&](const ARModel::Entry& entry) {
        return entry.row->kind == ARKind::plugIn && entry.row->presence != ARPresence::withdrawn &&
               ARApplicationPathOf(entry.row->path.view()) == application;
    });
    return !within.empty();
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
        takeBack();
    before_.clear();
    batchBegan_ = std::chrono::steady_clock::now();
    return accepted;
}

void ARPass::remember(std::string_view path) {
    const ARModel::Entry* const entry = model_.find(path);
    before_.push_back({std::string(path), entry ? std::optional(*entry) : std::nullopt});
}

void ARPass::takeBack() {
    for (auto before = before_.rbegin(); before != before_.rend(); ++before) {
        if (before->entry)
            model_.put(before->entry->row).seen = before->entry->seen;
        else
            model_.remove(before->path);
    }
    before_.clear();
}
