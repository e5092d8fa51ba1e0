#include "platform/signing/RefusalLog.h"

#include "platform/signing/SigningLog.h"

namespace platform {

void RefusalLog::report(const std::string& path, const Verification& result) {
    const auto reason = result.refusal();
    if (!reason)
        return;
    std::string entry = path + '\n' + *reason;
    for (const auto& [name, stamp, settled] : result.files()) {
        entry += '\n' + std::to_string(stamp.device) + ' ' + std::to_string(stamp.inode) + ' ' +
                 std::to_string(stamp.size) + ' ' + std::to_string(stamp.changedNanoseconds);
    }
    if (isNew(std::move(entry)))
        signingLog().standard("no entitlements for %{public}@: %{public}@", path, *reason);
}

bool RefusalLog::isNew(std::string entry) {
    const std::lock_guard lock(mutex_);
    if (reported_.size() >= mostRemembered)
        reported_.clear();
    return reported_.insert(std::move(entry)).second;
}

} // namespace platform
