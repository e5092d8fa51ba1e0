#include "platform/file/PathWatch.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <sys/inotify.h>
#include <unistd.h>
#include <utility>

#include "platform/log/Log.h"

namespace platform {

namespace {

constexpr std::uint32_t changes = IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_MOVED_TO |
                                  IN_MOVED_FROM | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF;

} // namespace

PathWatch::PathWatch(std::string path)
    : path_(std::move(path)), inotify_(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
    if (!inotify_)
        log::defaultLog().error("cannot watch %{public}s: %{errno}d", path_, errno);
    watchAll();
}

// From the top down: a watch is set before the folder below it is looked for, so that nothing is
// missed.
void PathWatch::watchAll() {
    const auto before = std::exchange(watches_, {});
    complete_ = static_cast<bool>(inotify_);
    std::string folder = path_.starts_with('/') ? "/" : ".";
    for (std::size_t begin = 0, end = 0; end < path_.size(); begin = end + 1) {
        end = std::min(path_.find('/', begin), path_.size());
        if (end == begin)
            continue;
        watch(folder, path_.substr(begin, end - begin));
        folder = path_.substr(0, end);
    }
    watch(folder, {});
    present_ = ::access(path_.c_str(), F_OK) == 0;
    for (const auto& [number, name] : before) {
        if (!watches_.contains(number))
            ::inotify_rm_watch(inotify_.get(), number);
    }
}

void PathWatch::watch(const std::string& folder, const std::string& name) {
    const int number = ::inotify_add_watch(inotify_.get(), folder.c_str(), changes | IN_ONLYDIR);
    if (number < 0) {
        complete_ = complete_ && (errno == ENOENT || errno == ENOTDIR);
        if (errno == ENOSPC)
            log::defaultLog().error("cannot watch %{public}s: %{errno}d", folder, errno);
        return;
    }
    const auto [known, isNew] = watches_.emplace(number, name);
    if (!isNew && known->second != name)
        known->second.clear(); // one folder by two ways
}

// An event without a name concerns the folder itself; one without a watch says that some were lost.
bool PathWatch::matters(int watch, std::string_view name) const {
    const auto watched = watches_.find(watch);
    if (watched == watches_.end())
        return watch < 0;
    return name.empty() || watched->second.empty() || name == watched->second;
}

bool PathWatch::readEvents() {
    alignas(struct ::inotify_event) std::array<char, 4096> room;
    bool mattered = false;
    for (ssize_t got; (got = ::read(inotify_.get(), room.data(), room.size())) > 0;) {
        for (std::size_t at = 0; at < static_cast<std::size_t>(got);) {
            const auto& event = *reinterpret_cast<const struct ::inotify_event*>(&room.at(at));
            mattered = mattered || matters(event.wd, event.len > 0 ? event.name : "");
            at += sizeof event + event.len;
        }
    }
    return mattered;
}

bool PathWatch::handleEvents() {
    if (!readEvents())
        return false;
    const bool before = present_;
    watchAll();
    return before || present_;
}

} // namespace platform
