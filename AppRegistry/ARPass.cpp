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

void ARPass::run(const platform::Places& places) {
    scanner_.scan(places);
    presence_ = ARPresence::added;
    const auto elsewhere = model_.pick([&](const ARModel::Entry& entry) {
        return entry.seen != number_ && entry.row->presence == ARPresence::added;
    });
    for (const ARRowPtr& row : elsewhere)
        scanner_.scanBundle(row->kind, std::string(row->path.view()));
    removeUnseen();
    flush();
}

std::optional<std::string> ARPass::add(const std::string& path) {
    presence_ = ARPresence::added;
    lastRefusal_ = "it is not a plug-in";
    const std::string_view application = ARApplicationPathOf(path);
    if (!application.empty())
        scanner_.scanBundle(ARKind::application, std::string(application));
    const ARModel::Entry* known = model_.find(path);
    if (known && known->row->presence == ARPresence::withdrawn)
        remove(known->row);
    scanner_.scanBundle(ARKind::plugIn, path);
    flush();
    const ARModel::Entry* entry = model_.find(path);
    if (entry && entry->seen == number_)
        return std::nullopt;
    return lastRefusal_;
}

bool ARPass::withdraw(const std::string& path) {
    const ARModel::Entry* entry = model_.find(path);
    if (!entry || entry->row->kind != ARKind::plugIn ||
        entry->row->presence == ARPresence::withdrawn)
        return false;
    ARBundleRow row = *entry->row;
    row.presence = ARPresence::withdrawn;
    replace(std::move(row));
    flush();
    return true;
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
    if (entry && unchanged(candidate, *entry->row)) {
        keep(candidate, *entry);
    } else {
        there = readAgain(candidate, entry ? entry->row.get() : nullptr);
    }
    flushWhenDue();
    // Of an application that was added for one plug-in the others stay unknown.
    return there && presence_ == ARPresence::found;
}

void ARPass::refused(const std::string& path, const std::string& reason) {
    lastRefusal_ = reason;
    complaints_.report(path, reason);
}

void ARPass::unreadable(const std::string& path, const std::string& reason) {
    unreadable_.push_back(path);
    refused(path, reason);
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
    if (placeholder != entry.row->placeholder)
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
    if (known && ARHasSameContent(before, {content->row.stamps, content->digests})) {
        keepSignature(known->id, *content);
        refresh(*known, candidate, content->row.stamps); // which may free what was known
        return true;
    }
    enlist(std::move(*content), candidate, known);
    return true;
}

// ---- Changes

void ARPass::enlist(ARBundleContent&& content, const ARCandidate& candidate,
                    const ARBundleRow* old) {
    ARBundleRow& row = content.row;
    row.id = model_.takeId();
    row.uuid = platform::Uuid::random();
    row.registered = now();
    row.presence = presence_;
    row.placeholder = row.kind == ARKind::application && files_.isPlaceholder(candidate);
    if (old) {
        row.originalIdentifier = old->originalIdentifier;
        remove(model_.find(candidate.path)->row);
    }
    keepSignature(row.id, content);
    const auto shared = std::make_shared<const ARBundleRow>(std::move(row));
    model_.put(shared).seen = number_;
    batch_.changes.added.push_back({*shared, content.digests, platform::ipc::encode(content.info)});
    batch_.added.push_back(shared);
    batch_.visible = true;
}

void ARPass::refresh(const ARBundleRow& old, const ARCandidate& candidate, const ARStamps& stamps) {
    ARBundleRow row = old;
    row.stamps = stamps;
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
    const bool visible = old.placeholder != shared->placeholder || old.presence != shared->presence;
    model_.put(shared).seen = number_;
    batch_.changes.updated.push_back(*shared);
    if (!visible)
        return;
    batch_.visible = true;
    batch_.updated.push_back(shared);
}

void ARPass::remove(ARRowPtr row) {
    model_.remove(row->path.view());
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

bool ARPass::maybeThere(std::string_view path) const {
    return std::ranges::any_of(unreadable_, [&](const std::string& folder) {
        return path == folder || liesBelow(path, folder);
    });
}

void ARPass::flushWhenDue() {
    if (std::chrono::steady_clock::now() - batchBegan_ >= longestBatch)
        flush();
}

void ARPass::flush() {
    if (!batch_.empty())
        apply_(std::exchange(batch_, {}));
    batchBegan_ = std::chrono::steady_clock::now();
}
