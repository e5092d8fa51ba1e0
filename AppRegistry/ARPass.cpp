#include "AppRegistry/ARPass.h"

#include <algorithm>

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

void ARPass::run(const platform::Places& places, ARDepth depth, const ARKeptFacts::Facts& kept) {
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
