#include "AppRegistry/ARComplaints.h"

#include "AppRegistry/ARLog.h"

void ARComplaints::report(const std::string& path, const std::string& reason) {
    std::string& last = reported_[path];
    if (last == reason)
        return;
    last = reason;
    ARLog().error("skipping %{public}@: %{public}@", path, reason);
}

void ARComplaints::forget(const std::string& path) {
    if (!reported_.empty())
        reported_.erase(path);
}
