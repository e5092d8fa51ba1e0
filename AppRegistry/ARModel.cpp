#include "AppRegistry/ARModel.h"

#include <algorithm>

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
    if (found == entries_.end())
        return entries_.emplace(path, Entry{std::move(row)}).first->second;
    // The key must lie in the row that stays.
    auto node = entries_.extract(found);
    node.key() = path;
    node.mapped().row = std::move(row);
    return entries_.insert(std::move(node)).position->second;
}

void ARModel::remove(std::string_view path) {
    entries_.erase(path);
}

void ARModel::sortById(std::vector<ARRowPtr>& rows) {
    std::ranges::sort(rows, {}, [](const ARRowPtr& row) { return row->id; });
}
