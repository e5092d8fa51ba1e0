#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

double secondsSince(Clock::time_point start) {
    return std::chrono::duration<double>(Clock::now() - start).count();
}

// Every folder and file of the applications, one in a line.
std::string writeList(const e2e::Home& home) {
    std::string path = home / "list";
    std::ofstream list(path);
    for (const auto& entry : fs::recursive_directory_iterator(home / "Applications"))
        list << entry.path().string() << '\n';
    return path;
}

// Runs this very program as the bare one; seconds from its start to its end.
double runBare(const char* kind, const std::string& list, const std::string& database) {
    const Clock::time_point start = Clock::now();
    const pid_t pid = fork();
    if (pid == 0) {
        execl("/proc/self/exe", "zpd-bench", kind, list.c_str(), database.c_str(), nullptr);
        _exit(127);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    if (status != 0)
        throw std::runtime_error(std::string("the bare program failed: ") + kind);
    return secondsSince(start);
}

// Seconds from the start of the daemon to its answer to a first "find".
double runDaemon(const e2e::Home& home) {
    const Clock::time_point start = Clock::now();
    e2e::Daemon daemon(home.path(),
                       {.service = "bench", .logLevel = "default", .waitUntilReady = false});
    for (;;) {
        try {
            e2e::WireClient client(daemon.socketPath());
            client.request(e2e::envelope("find"));
            break;
        } catch (const std::exception&) {
            if (!daemon.program().running() || secondsSince(start) > 300)
                throw;
            std::this_thread::sleep_for(std::chrono::microseconds(500));
        }
    }
    const double took = secondsSince(start);
    if (daemon.terminate() != 0)
        throw std::runtime_error("the daemon did not end well:\n" + daemon.wholeLog());
    return took;
}

void forget(const e2e::Home& home) {
    fs::remove_all(home / "lib");
    fs::remove(home / "bare.db");
}

} // namespace

void startRows(const Run& run, Cores cores) {
    if (cores == Cores::two)
        run.cores.asBoth();
    const std::size_t count = run.scaled(10000);
    const e2e::Home home;
    fill(home, {.plugIns = count});
    const std::string list = writeList(home);
    // Stamps that are too fresh to be believed are read again; that is not what a box meets.
    std::this_thread::sleep_for(std::chrono::seconds(1));
    std::vector<double> firstBare;
    std::vector<double> firstDaemon;
    std::vector<double> warmBare;
    std::vector<double> warmDaemon;
    for (int i = 0; i < (run.quick ? 1 : 3); ++i) {
        forget(home);
        firstBare.push_back(runBare("--bare-first", list, home / "bare.db"));
        firstDaemon.push_back(runDaemon(home));
        for (int k = 0; k < 3; ++k) {
            warmBare.push_back(runBare("--bare-warm", list, home / "lib/AppRegistry.db"));
            warmDaemon.push_back(runDaemon(home));
        }
    }
    const auto row = [&](const std::string& name, const std::vector<double>& measured,
                         const std::vector<double>& against, double bound) {
        run.table.add({.name = name + std::to_string(count) + " bundles",
                       .cores = nameOf(cores),
                       .measured = median(measured) * 1000,
                       .against = median(against) * 1000,
                       .unit = "ms",
                       .goal = Goal{.bound = bound},
                       .note = "to the first answer"});
    };
    row("warm start, ", warmDaemon, warmBare, 2.0);
    row("first start, ", firstDaemon, firstBare, 1.5);
}

} // namespace bench
