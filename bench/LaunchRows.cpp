#include <cerrno>
#include <csignal>
#include <future>
#include <spawn.h>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "Zephrin/ZPJobClient.h"
#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

using Clock = std::chrono::steady_clock;

void readByte(int socket) {
    char byte = 0;
    if (recv(socket, &byte, 1, 0) != 1)
        throw std::runtime_error("the program said nothing");
}

// Through the job manager, for this process as the host.
class Launched {
public:
    Launched(Rig& rig, const e2e::Home& home, const std::string& path)
        : jobs_(home / "run/com.tovana.jobd") {
        const std::string uuid = uuidAt(rig.client(), path);
        (void)replySize(rig.client(), readyFrame(uuid));
    }

    std::chrono::nanoseconds once() {
        const Clock::time_point start = Clock::now();
        std::promise<std::expected<ZPStartedPlugIn, platform::Error>> answer;
        jobs_.startPlugIn(runningIdentifier,
                          [&](auto outcome) { answer.set_value(std::move(outcome)); });
        auto started = answer.get_future().get();
        if (!started)
            throw std::runtime_error(started.error().description.value_or("it was not started"));
        readByte(started->socket.get());
        const auto took = Clock::now() - start;
        started->socket.reset();
        waitUntilGone(started->pid);
        return took;
    }

private:
    // What ends would otherwise be measured with the next start.
    static void waitUntilGone(pid_t pid) {
        while (kill(pid, 0) == 0)
            std::this_thread::sleep_for(std::chrono::microseconds(50));
    }

    ZPJobClient jobs_;
};

// The same program, and nothing done for anybody's safety.
std::chrono::nanoseconds spawnBare(const std::string& program) {
    constexpr int itsSocket = 3;
    const Clock::time_point start = Clock::now();
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0)
        throw std::runtime_error("socketpair failed");
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, ends[1], itsSocket);
    char* const arguments[] = {const_cast<char*>(program.c_str()), nullptr};
    char* const environment[] = {nullptr};
    pid_t pid = -1;
    const int error = posix_spawn(&pid, program.c_str(), &actions, nullptr, arguments, environment);
    posix_spawn_file_actions_destroy(&actions);
    close(ends[1]);
    if (error != 0)
        throw std::runtime_error("posix_spawn failed");
    readByte(ends[0]);
    const auto took = Clock::now() - start;
    close(ends[0]);
    waitpid(pid, nullptr, 0);
    return took;
}

} // namespace

void launchRows(const Run& run, Cores cores) {
    const e2e::Home home;
    chmod(home.path().c_str(), 0755); // as root, each plug-in has a user of its own
    const std::string path = addRunningPlugIn(home);
    Rig rig(home.path());
    run.cores.asClient(cores);
    Launched launched(rig, home, path);
    const std::string program = path + "/plugin";
    const Plan plan{.rounds = run.plan.rounds, .perRound = std::max(run.plan.perRound / 20, 5)};
    const Compared result =
        compare(Side{.once = [&] { return launched.once(); }, .server = rig.daemon().pid()},
                Side{.once = [&] { return spawnBare(program); }}, plan);
    const auto row = [&](const char* name, double measured, double against,
                         std::optional<Goal> goal) {
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = measured,
                       .against = against,
                       .unit = "us",
                       .goal = goal,
                       .note = geteuid() == 0 ? "as a user of its own, against a posix_spawn"
                                              : "against a posix_spawn"});
    };
    row("launch to first byte, p50", result.daemon.p50, result.floor.p50, Goal{.bound = 2.0});
    row("launch to first byte, p99", result.daemon.p99, result.floor.p99, std::nullopt);
    run.table.add({.name = "launch, CPU of the daemon alone",
                   .cores = nameOf(cores),
                   .measured = result.daemon.processor,
                   .against = result.floor.p50,
                   .unit = "us",
                   .note = "against the whole posix_spawn to the first byte"});
}

} // namespace bench
