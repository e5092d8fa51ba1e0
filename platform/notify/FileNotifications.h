#pragma once

#include <mutex>
#include <string>

#include "platform/notify/Notifications.h"

namespace platform {

// Notifications as files: one for each name in one folder, holding how often it was posted as
// 8 bytes, little-endian. Everybody may read them and watch them with inotify (IN_MODIFY, or
// IN_CREATE in the folder for the first post). Posting never waits: the files are not locked,
// since whoever may read one could hold a lock; two daemons that post at the same moment may
// count once, and observers still see a change. Owned by the platform; any thread.
class FileNotifications final : public Notifications {
public:
    explicit FileNotifications(std::string folder) : folder_(std::move(folder)) {}

    void post(std::string_view name) override;

private:
    [[nodiscard]] bool bump(const std::string& path) const;
    void makeFolder() const;

    const std::string folder_;
    std::mutex mutex_;
    bool complained_ = false; // about the last post; under the mutex
};

} // namespace platform
