#include "AppRegistry/ARModel.h"

#include <algorithm>
#include <utility>

#include "AppRegistry/ARScanner.h"

void ARModel::fill(std::vector<ARBundleRow> rows) {
    entries_.reserve(rows.size());
    for (ARBundleRow& row : rows) {
        lastId_ = std::max(lastId_, row.id);
        put(std::make_shared<const ARBundleRow>(std::move(row)));
    }
}

ARModel::Entry* ARModel::find(std::string_view path) {
    const auto found = entries_.find(path);
    return found == entries_.end() ? nullptr : &found->second;
}

ARModel::Entry& ARModel::put(ARRowPtr row) {
    const std::string_view path = row->path.view();
    const auto found = entries_.find(path);
    if (found == entries_.end()) {
        Entry& entry = entries_.emplace(path, Entry{std::move(row)}).first->second;
        join(entry);
        return entry;
    }
    // The key must lie in the row that stays.
    auto node = entries_.extract(found);
    node.key() = path;
    node.mapped().row = std::move(row);
    return entries_.insert(std::move(node)).position->second;
}

void ARModel::remove(std::string_view path) {
    const auto found = entries_.find(path);
    if (found == entries_.end())
        return;
    leave(found->second);
    entries_.erase(found);
}

const ARModel::Entry* ARModel::firstWithin(std::string_view application) const {
    const auto first = within_.find(application);
    return first == within_.end() ? nullptr : first->second;
}

// After one of its neighbours, or as the first of its application.
void ARModel::join(Entry& entry) {
    const std::string_view application = ARApplicationPathOf(entry.row->path.view());
    if (application.empty())
        return;
    Entry* neighbour = lastJoined_;
    if (!neighbour || ARApplicationPathOf(neighbour->row->path.view()) != application)
        neighbour = within_.emplace(application, &entry).first->second;
    lastJoined_ = &entry;
    if (neighbour == &entry)
        return;
    entry.previous = neighbour;
    entry.next = std::exchange(neighbour->next, &entry);
    if (entry.next)
        entry.next->previous = &entry;
}

void ARModel::leave(Entry& entry) {
    if (lastJoined_ == &entry)
        lastJoined_ = nullptr;
    if (entry.next)
        entry.next->previous = entry.previous;
    if (entry.previous) {
        entry.previous->next = entry.next;
        return;
    }
    const auto first = within_.find(ARApplicationPathOf(entry.row->path.view()));
    if (first == within_.end())
        return;
    first->second = entry.next;
    if (!entry.next)
        within_.erase(first);
}

void ARModel::sortById(std::vector<ARRowPtr>& rows) {
    std::ranges::sort(rows, {}, [](const ARRowPtr& row) { return row->id; });
}
