#include "Zephrin/ZPNotificationObserver.h"

#include <atomic>
#include <cassert>
#include <cstdint>
#include <poll.h>
#include <pthread.h>
#include <string>
#include <sys/eventfd.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "Zephrin/ZPDLog.h"
#include "platform/file/File.h"
#include "platform/notify/FileNotificationObserver.h"
#include "platform/paths/Places.h"
#include "platform/queue/SerialQueue.h"

// What an observer is made of. Its own thread waits for the file system and runs the block, on
// the queue; the owner's thread only starts and ends it.
class ZPNotificationObserver::Watcher {
public:
    Watcher(std::string_view name, Block block)
        : observer_(platform::Places::forThisProcess().notify, name),
          block_(std::move(block)),
          end_(::eventfd(0, EFD_CLOEXEC)),
          thread_([this] { watch(); }) {}

    Watcher(const Watcher&) = delete;
    Watcher& operator=(const Watcher&) = delete;

    ~Watcher() {
        assert(!queue_.isCurrent());
        ending_ = true;
        const std::uint64_t one = 1;
        (void)!::write(end_.get(), &one, sizeof one);
        thread_.join();
    }

private:
    void watch() {
        ::pthread_setname_np(::pthread_self(), "zp_notify");
        while (!ending_) {
            wait();
            if (observer_.handleEvents() && !ending_)
                queue_.sync(block_);
        }
    }

    void wait() {
        constexpr int withoutEnd = 500; // milliseconds; when there was no descriptor for it
        ::pollfd watched[] = {{observer_.descriptor(), POLLIN, 0}, {end_.get(), POLLIN, 0}};
        ::poll(watched, std::size(watched), end_ ? observer_.patience() : withoutEnd);
    }

    platform::FileNotificationObserver observer_;
    Block block_;
    platform::SerialQueue queue_{"zp_notify"};
    const platform::UniqueFd end_; // readable at the end
    std::atomic<bool> ending_ = false;
    std::thread thread_; // uses all of the above
};

ZPNotificationObserver::ZPNotificationObserver(std::string_view name, Block block) {
    if (platform::isPlainName(name))
        watcher_ = std::make_unique<Watcher>(name, std::move(block));
    else
        ZPDLogOps().error("cannot observe %{public}s: not the name of a notification", name);
}

ZPNotificationObserver::~ZPNotificationObserver() = default;
