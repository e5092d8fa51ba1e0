#include <chrono>
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <sys/inotify.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "bench/Bundles.h"
#include "bench/Bystander.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr const char* manyPoint = "com.example.bench.many";
constexpr const char* onePoint = "com.example.bench.one";

// Reads every file below a folder; how many bytes that were.
std::size_t readAllBelow(const std::string& folder) {
    std::size_t bytes = 0;
    std::vector<char> room(std::size_t{64} << 10);
    for (const auto& entry : fs::recursive_directory_iterator(folder)) {
        const int file = open(entry.path().c_str(), O_RDONLY | O_CLOEXEC);
        for (ssize_t got; (got = read(file, room.data(), room.size())) > 0;)
            bytes += static_cast<std::size_t>(got);
        close(file);
    }
    return bytes;
}

std::size_t occurrences(const std::string& text, const std::string& part) {
    std::size_t count = 0;
    for (auto at = text.find(part); at != text.npos; at = text.find(part, at + 1))
        ++count;
    return count;
}

// How many plug-ins a "match" shows: each form has this key once.
std::size_t shown(Rig& rig, const std::string& request) {
    rig.client().send(request);
    const auto reply = rig.client().receive(60s);
    if (!reply)
        throw std::runtime_error("the daemon ended the connection");
    return occurrences(reply->body, "original-identifier");
}

// Asks until a "match" shows so many.
void await(Rig& rig, const std::string& request, std::size_t count,
           std::chrono::microseconds pause) {
    const Clock::time_point start = Clock::now();
    while (shown(rig, request) != count) {
        if (Clock::now() - start > 60s)
            throw std::runtime_error("what was installed or removed is not noticed");
        std::this_thread::sleep_for(pause);
    }
}

void move(const std::string& from, const std::string& to) {
    if (std::rename(from.c_str(), to.c_str()) != 0)
        throw std::runtime_error("cannot move " + from);
}

std::string prepare(const e2e::Home& home, const std::string& name, const char* point) {
    const std::string path = e2e::addAppWith(
        home, name, {.identifier = point + ("." + name), .point = point}, "prepared");
    e2e::writeFile(path + "/plugin", std::string(Mix().executable, '#'), 0755);
    return home / ("prepared/" + name + ".app");
}

double millisecondsOf(std::chrono::nanoseconds time) {
    return std::chrono::duration<double, std::milli>(time).count();
}

void manyRow(const Run& run, Cores cores, const e2e::Home& home, Rig& rig) {
    const std::size_t count = run.scaled(1000);
    std::vector<std::string> names;
    for (std::size_t i = 0; i < count; ++i)
        names.push_back(fs::path(prepare(home, "Many" + std::to_string(i), manyPoint)).filename());
    const auto moveAll = [&](const std::string& from, const std::string& to) {
        for (const std::string& name : names)
            move(home / (from + name), home / (to + name));
    };
    const std::string request = matchFrame(manyPoint);
    std::vector<double> ours;
    std::vector<double> theirs;
    for (int i = 0; i < (run.quick ? 1 : 5); ++i) {
        std::this_thread::sleep_for(1s); // stamps too fresh are not believed
        Clock::time_point start = Clock::now();
        readAllBelow(home / "prepared");
        theirs.push_back(millisecondsOf(Clock::now() - start));
        start = Clock::now();
        moveAll("prepared/", "Applications/");
        await(rig, request, count, 5ms); // seldom, as each answer is large
        ours.push_back(millisecondsOf(Clock::now() - start));
        moveAll("Applications/", "prepared/");
        await(rig, request, 0, 5ms);
    }
    run.table.add({.name = std::to_string(count) + " installs, until all are found",
                   .cores = nameOf(cores),
                   .measured = median(ours),
                   .against = median(theirs),
                   .unit = "ms",
                   .note = "against listing the folder and reading the same files"});
}

// A process that waits for applications in a folder, and reads what comes: the least that an
// install takes.
class BareWatcher {
public:
    BareWatcher(const Run& run, Cores cores, const std::string& folder)
        : pipe_(made()), watcher_(run, cores, [&run, folder, this] {
              run.cores.asServer();
              watch(folder);
          }) {}

    // Until one more was read.
    void await() const {
        char byte = 0;
        if (read(pipe_.reading, &byte, 1) != 1)
            throw std::runtime_error("the bare watcher is gone");
    }

private:
    struct Pipe {
        int reading;
        int writing;
    };

    static Pipe made() {
        int ends[2];
        if (pipe2(ends, O_CLOEXEC) != 0)
            throw std::runtime_error("pipe failed");
        return {ends[0], ends[1]};
    }

    void watch(const std::string& folder) const {
        const int inotify = inotify_init1(IN_CLOEXEC);
        inotify_add_watch(inotify, folder.c_str(), IN_MOVED_TO);
        alignas(inotify_event) char room[4096];
        while (read(inotify, room, sizeof room) > 0) {
            const auto* const event = reinterpret_cast<const inotify_event*>(room);
            readAllBelow(folder + "/" + event->name);
            (void)!write(pipe_.writing, "x", 1);
        }
    }

    Pipe pipe_;
    Bystander watcher_;
};

void oneByOneRows(const Run& run, Cores cores, const e2e::Home& home, Rig& rig) {
    const std::string prepared = prepare(home, "One", onePoint);
    fs::create_directories(home / "bare");
    const BareWatcher watcher(run, cores, home / "bare");
    const std::string request = matchFrame(onePoint);
    std::vector<double> removals;
    // In, until it is there, and out again, which is not measured here.
    const Side ours{.once = [&] {
        const std::string installed = home / "Applications/One.app";
        const Clock::time_point start = Clock::now();
        move(prepared, installed);
        await(rig, request, 1, 50us);
        const auto took = Clock::now() - start;
        const Clock::time_point middle = Clock::now();
        move(installed, prepared);
        await(rig, request, 0, 50us);
        removals.push_back(millisecondsOf(Clock::now() - middle));
        return took;
    }};
    const Side theirs{.once = [&] {
        const std::string installed = home / "bare/One.app";
        const Clock::time_point start = Clock::now();
        move(prepared, installed);
        watcher.await();
        const auto took = Clock::now() - start;
        move(installed, prepared);
        return took;
    }};
    const Compared result =
        compare(ours, theirs, {.rounds = run.quick ? 2 : 10, .perRound = run.quick ? 10 : 20});
    const auto row = [&](const char* name, double measured, double against) {
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = measured,
                       .against = against,
                       .unit = "ms",
                       .note = "against inotify and reading the same; it waits for quiet"});
    };
    row("install, from rename to match, p50", result.daemon.p50 / 1000, result.floor.p50 / 1000);
    row("install, from rename to match, p99", result.daemon.p99 / 1000, result.floor.p99 / 1000);
    row("removal, from rename to match, p50", median(removals), result.floor.p50 / 1000);
}

} // namespace

void installRows(const Run& run, Cores cores) {
    const e2e::Home home;
    fill(home, {.plugIns = run.scaled(1000)});
    Rig rig(home.path());
    run.cores.asClient(cores);
    oneByOneRows(run, cores, home, rig);
    manyRow(run, cores, home, rig);
}

} // namespace bench
