#include "AppRegistry/ARComplaints.h"

#include "AppRegistry/ARLog.h"

void ARComplaints::report(const std::string& path, const std::string& reason, std::uint64_t pass) {
    Complaint& last = reported_[path];
    last.pass = pass;
    if (last.reason == reason)
        return;
    last.reason = reason;
    ARLog().error("skipping %{public}@: %{public}@", path, reason);
}

void ARComplaints::forget(const std::string& path) {
    if (!reported_.empty())
        reported_.erase(path);
}

void ARComplaints::endItem(const std::string& item, std::uint64_t pass) {
    auto at = reported_.lower_bound(item);
    while (at != reported_.end() && at->first.starts_with(item)) {
        const bool within = at->first.size() == item.size() || at->first[item.size()] == '/';
        at = within && at->second.pass != pass ? reported_.erase(at) : std::next(at);
    }
}

void ARComplaints::endPass(std::uint64_t pass) {
    std::erase_if(reported_, [pass](const auto& each) { return each.second.pass != pass; });
}
