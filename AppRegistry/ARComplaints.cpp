#include "AppRegistry/ARComplaints.h"

bool ARComplaints::isNew(const std::string& path, const std::string& reason) {
    std::string& last = reported_[path];
    if (last == reason)
        return false;
    last = reason;
    return true;
}

void ARComplaints::forget(const std::string& path) {
    if (!reported_.empty())
        reported_.erase(path);
}
