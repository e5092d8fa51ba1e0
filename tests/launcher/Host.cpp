#include "tests/launcher/Host.h"

#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "tests/support/Files.h"

namespace tests {

namespace {

constexpr int patience = 20'000; // milliseconds

bool isReadable(int descriptor) {
    pollfd poll{descriptor, POLLIN, 0};
    return ::poll(&poll, 1, patience) > 0;
}

} // namespace

Other::Other(pid_t pid)
    : pid_(pid), process_(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0))) {}

bool Other::isThere() const {
    return pid_ > 0 && ::kill(pid_, 0) == 0;
}

bool Other::vanishes() const {
    const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(patience);
    if (!isReadable(process_.get()))
        return false;
    siginfo_t info{}; // it may be a child of this process by now
    (void)::waitid(P_PIDFD, static_cast<id_t>(process_.get()), &info, WEXITED | WNOHANG);
    while (isThere() && std::chrono::steady_clock::now() < end)
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    return !isThere();
}

const platform::Launcher::Started* Launched::started() const {
    const auto result = told.value();
    return result && *result ? &**result : nullptr;
}

std::optional<platform::Error> Launched::error() const {
    const auto result = told.value();
    return result && !*result ? std::optional(result->error()) : std::nullopt;
}

std::string Launched::hear() {
    std::string line;
    char c = 0;
    while (isReadable(socket.get()) && ::read(socket.get(), &c, 1) == 1 && c != '\n')
        line += c;
    return line;
}

void Launched::say(const std::string& line) {
    const std::string text = line + "\n";
    (void)::send(socket.get(), text.data(), text.size(), MSG_NOSIGNAL);
}

std::string Launched::ask(const std::string& line) {
    say(line);
    return hear();
}

Other Launched::make(const std::string& kind) {
    return Other(std::atoi(ask(kind).c_str()));
}

Host::Host(const std::string& launcher) {
    setMode(folder_.path(), 0755);
    std::filesystem::create_directories(folder_ / "bundle");
    std::filesystem::copy_file(programs() + "/launcher_probe", folder_ / "bundle/probe");
    std::filesystem::create_directories(container());
    if (::geteuid() == 0)
        giveAway(container(), launchedUser);
    loop_.start();
    onLoop([&] {
        launcher_ = std::make_unique<platform::LauncherProcess>(
            loop_, launcher.empty() ? programs() + "/zpd-launcher" : launcher);
    });
}

Host::~Host() {
    onLoop([this] { launcher_.reset(); });
}

void Host::onLoop(const std::function<void()>& act) {
    const Signal done;
    loop_.post([&] {
        act();
        done.give();
    });
    EXPECT_TRUE(done.comes());
}

std::string Host::programs() {
    return ZEPHRIN_TEST_PROGRAMS;
}

platform::Launcher::Launch Host::usual() const {
    platform::Launcher::Launch launch;
    launch.path = folder_ / "bundle/probe";
    launch.executable.reset(::open(launch.path.c_str(), O_RDONLY | O_CLOEXEC));
    launch.confinement = {.profile = "plugin",
                          .bundle = folder_ / "bundle",
                          .container = container(),
                          .user = ::geteuid() == 0 ? std::optional(launchedUser) : std::nullopt};
    return launch;
}

Launched Host::launch(platform::Launcher::Launch launch) {
    int ends[2];
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
    Launched run;
    run.socket.reset(ends[0]);
    launch.socket.reset(ends[1]);
    onLoop([&] {
        run.id = launcher_->launch(
            std::move(launch),
            [told = run.told](Launched::Told result) {
                told.give(std::make_shared<Launched::Told>(std::move(result)));
            },
            [ended = run.ended] { ended.give(); });
    });
    return run;
}

Launched Host::start() {
    Launched run = launch(usual());
    const auto error = run.error();
    EXPECT_FALSE(error) << describe(*error);
    EXPECT_EQ(run.hear(), "ready");
    return run;
}

void Host::end(const Launched& run) {
    onLoop([&] { launcher_->end(run.id); });
}

pid_t Host::launcherPid() {
    pid_t pid = 0;
    onLoop([&] { pid = launcher_->pid(); });
    return pid;
}

} // namespace tests
