#include "AppRegistry/ARSnapshot.h"

#include <algorithm>
#include <tuple>

#include "AppRegistry/ARScanner.h"

namespace {

constexpr auto idOf = [](const ARPlugInPtr& plugIn) { return plugIn->row().id; };
constexpr auto identifierOf = [](const ARRowPtr& row) { return row->identifier.view(); };
constexpr auto identifierAndPathOf = [](const ARRowPtr& row) {
    return std::tuple(row->identifier.view(), row->path.view());
};

// A vector that may be changed: its own, when another snapshot shares it.
template <class T>
std::vector<T>& unshared(std::shared_ptr<std::vector<T>>& list) {
    if (list.use_count() > 1)
        list = std::make_shared<std::vector<T>>(*list);
    return *list;
}

void insert(ARSnapshot::PlugIns& list, const ARPlugInPtr& plugIn) {
    list.insert(std::ranges::upper_bound(list, plugIn->row().id, {}, idOf), plugIn);
}

void erase(ARSnapshot::PlugIns& list, std::int64_t id) {
    const auto at = std::ranges::lower_bound(list, id, {}, idOf);
    if (at != list.end() && (*at)->row().id == id)
        list.erase(at);
}

} // namespace

ARPlugInPtr ARSnapshot::plugIn(const platform::Uuid& uuid) const {
    const ARPlugInPtr* found = byUuid_.find(uuid);
    return found ? *found : nullptr;
}

ARPlugInPtr ARSnapshot::plugInAt(std::string_view path) const {
    const ARPlugInPtr* found = byPath_.find(path);
    return found ? *found : nullptr;
}

ARApplicationPtr ARSnapshot::application(std::string_view path) const {
    const ARApplicationPtr* found = applications_.find(path);
    return found ? *found : nullptr;
}

std::span<const ARPlugInPtr> ARSnapshot::plugInsWithin(std::string_view application) const {
    const Group* group = byApplication_.find(application);
    return group ? std::span<const ARPlugInPtr>(*group->members) : std::span<const ARPlugInPtr>();
}

ARSnapshot::PlugIns
ARSnapshot::plugInsWithPoints(std::span<const platform::SharedBytes> keys) const {
    PlugIns found;
    for (const platform::SharedBytes& key : keys) {
        if (const Group* group = byPoint_.find(key.view()))
            found.insert(found.end(), group->members->begin(), group->members->end());
    }
    if (keys.size() > 1) { // one may stand under several of them
        std::ranges::sort(found, {}, idOf);
        const auto repeated = std::ranges::unique(found, {}, idOf);
        found.erase(repeated.begin(), repeated.end());
    }
    return found;
}

ARRowPtr ARSnapshot::extensionPoint(std::string_view identifier) const {
    const auto at = std::ranges::lower_bound(*extensionPoints_, identifier, {}, identifierOf);
    return at != extensionPoints_->end() && identifierOf(*at) == identifier ? *at : nullptr;
}

// ---- Changes

template <class Change>
void ARSnapshot::changeGroup(Groups& groups, const platform::SharedBytes& key, Change&& change) {
    Group* group = groups.edit(key.view());
    if (!group) {
        groups.put({key, std::make_shared<PlugIns>()});
        group = groups.edit(key.view());
    }
    PlugIns& members = unshared(group->members);
    change(members);
    if (members.empty())
        groups.remove(key.view());
}

template <class Change>
void ARSnapshot::changeGroups(const ARRegisteredPlugIn& plugIn, Change&& change) {
    for (const platform::SharedBytes& point : plugIn.row().points)
        changeGroup(byPoint_, point, change);
    const std::string_view application = ARApplicationPathOf(plugIn.path());
    if (!application.empty())
        changeGroup(byApplication_, platform::SharedBytes(application), change);
    change(unshared(all_));
}

void ARSnapshot::add(const ARPlugInPtr& plugIn) {
    byUuid_.put(plugIn);
    byPath_.put(plugIn);
    changeGroups(*plugIn, [&](PlugIns& list) { insert(list, plugIn); });
}

void ARSnapshot::remove(const ARRegisteredPlugIn& plugIn) {
    const std::int64_t id = plugIn.row().id;
    byUuid_.remove(plugIn.plugInUUID());
    if (const ARPlugInPtr* there = byPath_.find(plugIn.path()); there && (*there)->row().id == id)
        byPath_.remove(plugIn.path());
    changeGroups(plugIn, [id](PlugIns& list) { erase(list, id); });
}

void ARSnapshot::replace(const ARPlugInPtr& plugIn) {
    byUuid_.put(plugIn);
    byPath_.put(plugIn);
    changeGroups(*plugIn, [&](PlugIns& list) {
        erase(list, plugIn->row().id);
        insert(list, plugIn);
    });
}

void ARSnapshot::putApplication(ARApplicationPtr application) {
    applications_.put(std::move(application));
}

void ARSnapshot::removeApplication(std::string_view path) {
    applications_.remove(path);
}

void ARSnapshot::putExtensionPoint(const ARRowPtr& row) {
    removeExtensionPoint(*row);
    auto& list = unshared(extensionPoints_);
    list.insert(std::ranges::upper_bound(list, identifierAndPathOf(row), {}, identifierAndPathOf),
                row);
}

void ARSnapshot::removeExtensionPoint(const ARBundleRow& row) {
    auto& list = unshared(extensionPoints_);
    std::erase_if(list, [&](const ARRowPtr& other) { return other->path == row.path; });
}
