#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <stdexcept>
#include <sys/inotify.h>
#include <thread>
#include <unistd.h>

#include "Zephrin/ZPNotificationObserver.h"
#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"
#include "platform/notify/FileNotifications.h"

namespace bench {

namespace {

using Clock = std::chrono::steady_clock;

// When something was last heard, and waiting for the next time; told by one thread, asked by
// another.
class Heard {
public:
    void tell() {
        when_ = Clock::now();
        ++times_;
        times_.notify_one();
    }

    // Until it was told once more than it was before `act`; what passed since the beginning.
    template <class Act>
    std::chrono::nanoseconds after(Act&& act) {
        const std::uint32_t before = times_;
        const Clock::time_point start = Clock::now();
        act();
        times_.wait(before);
        return when_ - start;
    }

private:
    Clock::time_point when_; // written before times_ grows, read after
    std::atomic<std::uint32_t> times_ = 0;
};

// The least that hearing of a change takes: a thread in inotify's read.
class BareWatch {
public:
    explicit BareWatch(std::string folder)
        : file_(folder + "/bare"), inotify_(inotify_init1(IN_CLOEXEC)) {
        if (inotify_add_watch(inotify_, folder.c_str(), IN_CLOSE_WRITE) < 0)
            throw std::runtime_error("cannot watch " + folder);
        thread_ = std::thread([this] { watch(); });
    }

    BareWatch(const BareWatch&) = delete;
    BareWatch& operator=(const BareWatch&) = delete;

    ~BareWatch() {
        ending_ = true;
        change();
        thread_.join();
        close(inotify_);
    }

    std::chrono::nanoseconds heard() {
        return heard_.after([this] { change(); });
    }

private:
    void change() {
        const int file = open(file_.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0644);
        std::uint64_t count = 0;
        (void)!pread(file, &count, sizeof count, 0);
        ++count;
        (void)!pwrite(file, &count, sizeof count, 0);
        close(file);
    }

    void watch() {
        alignas(inotify_event) char room[4096];
        while (!ending_ && read(inotify_, room, sizeof room) > 0)
            heard_.tell();
    }

    std::string file_;
    int inotify_;
    std::atomic<bool> ending_ = false;
    Heard heard_;
    std::thread thread_;
};

void row(const Run& run, Cores cores, const char* name, const Compared& result, const char* note) {
    run.table.add({.name = name,
                   .cores = nameOf(cores),
                   .measured = result.daemon.p50,
                   .against = result.floor.p50,
                   .unit = "us",
                   .note = note});
}

// Posts, heard in this process; without a daemon.
void postRow(const Run& run, Cores cores, const e2e::Home& home) {
    const std::string folder = home / "run/notify";
    const std::string bareFolder = home / "bare";
    e2e::writeFile(bareFolder + "/bare", "");
    platform::FileNotifications notifications(folder);
    notifications.post(ZPNotificationObserver::annotationChange);
    Heard heard;
    ZPNotificationObserver observer(ZPNotificationObserver::annotationChange,
                                    [&] { heard.tell(); });
    const Side ours{.once = [&] {
        return heard.after([&] { notifications.post(ZPNotificationObserver::annotationChange); });
    }};
    BareWatch watch(bareFolder);
    row(run, cores, "from a post to the observer's block, p50",
        compare(ours, Side{.once = [&] { return watch.heard(); }}, run.plan),
        "against a bare write and inotify's wake-up");
}

void annotateRow(const Run& run, Cores cores, const e2e::Home& home) {
    const std::string path = addPlugInWithForm(home, 4096);
    Rig rig(home.path());
    const std::string uuid = uuidAt(rig.client(), path);
    Heard heard;
    run.cores.asClient(cores);
    ZPNotificationObserver observer(ZPNotificationObserver::annotationChange,
                                    [&] { heard.tell(); });
    int election = 1;
    std::chrono::nanoseconds trip{};
    const auto annotate = [&] {
        election = 3 - election;
        const Clock::time_point start = Clock::now();
        rig.client().send(annotateFrame(uuid, election));
        if (!rig.client().receive())
            throw std::runtime_error("the daemon ended the connection");
        trip = Clock::now() - start;
    };
    const Side toBlock{.once = [&] { return heard.after(annotate); }};
    const Side toReply{.once = [&] {
        heard.after(annotate);
        return trip;
    }};
    const Plan plan{.rounds = run.plan.rounds, .perRound = std::max(run.plan.perRound / 20, 5)};
    row(run, cores, "from an annotate to the observer's block, p50",
        compare(toBlock, toReply, plan), "against the annotate's reply, with its sync");
}

} // namespace

void notifyRows(const Run& run, Cores cores) {
    const e2e::Home home;
    setenv("ZEPHRIN_HOME", home.path().c_str(), 1);
    annotateRow(run, cores, home);
    postRow(run, cores, home);
    unsetenv("ZEPHRIN_HOME");
}

} // namespace bench
