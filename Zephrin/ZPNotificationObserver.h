#pragma once

#include <functional>
#include <memory>
#include <string_view>

// A host's way to hear of what changed on the box: observes one notification, by its name, and
// calls a block when it was posted. Notifications carry nothing but that they were posted.
//
// Owned by whoever wants to hear. The block runs on a serial queue of the observer's own, one call
// at a time, as soon as the post was noticed; never before the constructor has begun, never after
// the destructor has ended (which waits for a call that runs). Posts shortly after each other, or
// while the block runs, may come as one call; the last one always comes as a call, and there is no
// call without a post. What was posted before the observer was made is not told: ask for the
// state after making it, and again with each call.
//
// Needs no connection and no daemon: the folder of notifications may come later, go, and come
// back with the daemon. Where the kernel has no watch to spare (inotify(7)), posts are noticed
// within a second. There are no errors besides that; a name that can be none is never posted, and
// told once in the log.
class ZPNotificationObserver {
public:
    using Block = std::move_only_function<void()>;

    // Annotations of plug-ins (the users' elections among them) changed, or holds on plug-ins.
    static constexpr std::string_view annotationChange = "com.tovana.zephrin.annotation-change";

    // Posts from here on are told. `name` is one to 255 bytes without "/" and control characters.
    // The folder is that of the daemon which this process would talk to.
    ZPNotificationObserver(std::string_view name, Block block);
    ZPNotificationObserver(const ZPNotificationObserver&) = delete;
    ZPNotificationObserver& operator=(const ZPNotificationObserver&) = delete;
    // REQUIRES: not called from the block.
    ~ZPNotificationObserver();

private:
    class Watcher;

    std::unique_ptr<Watcher> watcher_; // nothing for a name that can be none
};
