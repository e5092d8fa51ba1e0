#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <grp.h>
#include <sstream>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "platform/ipc/FrameText.h"
#include "platform/jobs/LauncherProgram.h"
#include "tests/launcher/Host.h"
#include "tests/support/Files.h"

using namespace tests;
namespace ipc = platform::ipc;
using platform::describe;
using platform::Dictionary;
using platform::Launcher;
using testing::HasSubstr;

namespace {

int descriptorsOf(pid_t pid) {
    const std::filesystem::directory_iterator all("/proc/" + std::to_string(pid) + "/fd");
    return static_cast<int>(std::distance(begin(all), end(all)));
}

std::string childrenOf(pid_t pid) {
    const std::string number = std::to_string(pid);
    return contentOf("/proc/" + number + "/task/" + number + "/children");
}

bool isRoot() {
    return ::geteuid() == 0;
}

} // namespace

// The first, since it forks: before there is any thread.
TEST(LauncherTest, aDeadOwnerTakesAllWithIt) {
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    ::prctl(PR_SET_CHILD_SUBREAPER, 1); // of the launcher
    const pid_t owner = ::fork();
    if (owner == 0) {
        Host host;
        Launched run = host.start();
        run.ask("ignore");
        const std::string made = std::to_string(run.started()->pid) + " " + run.ask("orphan") +
                                 " " + run.ask("session") + " " +
                                 std::to_string(host.launcherPid()) + "\n";
        (void)!::write(ends[1], made.data(), made.size());
        for (;;)
            ::pause();
    }
    char text[200] = "";
    ASSERT_GT(::read(ends[0], text, sizeof text - 1), 0);
    std::vector<Other> all;
    std::istringstream numbers(text);
    for (pid_t pid = 0; numbers >> pid;)
        all.emplace_back(pid);
    EXPECT_EQ(all.size(), 4U);
    ::kill(owner, SIGKILL);
    ASSERT_EQ(::waitpid(owner, nullptr, 0), owner);
    for (const Other& each : all)
        EXPECT_TRUE(each.vanishes());
}

TEST(LauncherTest, aProgramIsMadeOfExactlyWhatTheLaunchSays) {
    Host host;
    auto launch = host.usual();
    launch.path = "/first/argument";
    launch.environment = {
        {"B", "of = both"}, {"ZEPHRIN_SOCKET", "77"}, {"LD_BIND_NOW", "1"}, {"EMPTY", ""}};
    Launched run = host.launch(std::move(launch));
    ASSERT_TRUE(run.started()) << describe(*run.error());
    EXPECT_EQ(run.hear(), "ready");
    EXPECT_EQ(run.ask("environment"), "B=of = both EMPTY= LD_BIND_NOW=1 ZEPHRIN_SOCKET=3");
    EXPECT_EQ(run.ask("descriptors"), "0:null 1:null 2:null 3:socket");
    EXPECT_EQ(run.ask("signals"), "");
    const uid_t user = isRoot() ? launchedUser : ::getuid();
    const gid_t group = isRoot() ? launchedUser : ::getegid();
    const int groups = isRoot() ? 0 : ::getgroups(0, nullptr);
    EXPECT_EQ(run.ask("identity"),
              std::to_string(user) + " " + std::to_string(group) + " " + std::to_string(groups) +
                  " " + host.container() +
                  " leads umask 63 core 0 no new privileges 1 /first/argument");
    EXPECT_TRUE(run.started()->confinement.contains("enforced"));
}

TEST(LauncherTest, aLaunchThatFailsSaysAtWhatAndWhyAndLeavesNothing) {
    Host host;
    const auto file = [&](const char* name, const std::string& content, mode_t mode) {
        return [&, name, content, mode](Launcher::Launch& launch) {
            const std::string path = host.folder().write(std::string("bundle/") + name, content);
            setMode(path, mode);
            launch.executable.reset(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
        };
    };

    const struct {
        std::function<void(Launcher::Launch&)> change;
        int error;
        const char* text;
    } cases[] = {
        {file("script", "#!/bin/sh\n", 0755), ENOENT, "script"},
        {file("text", "no program at all", 0755), ENOEXEC, "executed"},
        {file("empty", "", 0755), ENOEXEC, "executed"},
        {file("mode", contentOf(host.folder() / "bundle/probe"), 0644), EACCES, "executed"},
        {[](auto& l) { l.executable.reset(); }, EINVAL, "no process"},
        {[](auto& l) { l.confinement.profile = "none such"; }, EINVAL, "none such"},
        {[](auto& l) { l.confinement.container = "/nonexistent"; }, ENOENT, ""},
        {[](auto& l) { l.confinement.user = 0; }, EINVAL, "no process"},
        {[](auto& l) { l.confinement.user = static_cast<uid_t>(-1); }, EINVAL, "no process"},
        {[](auto& l) { l.environment = {{"A=B", "c"}}; }, EINVAL, "no process"},
        {[](auto& l) { l.environment = {{"", "c"}}; }, EINVAL, "no process"},
        {[](auto& l) { l.environment = {{"A", 1}}; }, EINVAL, "no process"},
        {[](auto& l) { l.environment = {{"A", std::string("b\0c", 3)}}; }, EINVAL, "no process"},
        {[](auto& l) { l.environment = {{"A", std::string(1 << 20, 'a')}}; }, E2BIG, "executed"},
        {[](auto& l) { l.environment = {{"A", std::string(17 << 20, 'a')}}; }, E2BIG, "too large"},
    };

    for (const auto& each : cases) {
        auto launch = host.usual();
        each.change(launch);
        const Launched run = host.launch(std::move(launch));
        const auto error = run.error();
        ASSERT_TRUE(error) << each.text;
        EXPECT_EQ(error->code, each.error) << describe(*error);
        EXPECT_THAT(error->description.value_or(""), HasSubstr(each.text));
        EXPECT_EQ(childrenOf(host.launcherPid()), "") << each.text;
    }
    (void)host.start(); // it goes on
}

// Each program makes processes, which are gone with it however it ends, before that is told.
TEST(LauncherTest, theWholeTreeEnds) {
    Host host;
    const std::vector<std::vector<std::string>> trees{
        {},
        {"ignore"},
        {"child", "stubborn"},
        {"ignore", "orphan", "stubborn"},
        {"session"},
        {"session orphan", "ignore"},
        {"child", "child", "stubborn", "orphan", "session", "session orphan", "child"},
        {"stop"}, // itself: it cannot be told anything then
    };
    for (const bool byItself : {false, true}) {
        std::vector<Launched> runs;
        std::vector<std::vector<Other>> processes;
        for (const auto& tree : trees) {
            Launched& run = runs.emplace_back(host.start());
            std::vector<Other>& all = processes.emplace_back();
            all.emplace_back(run.started()->pid);
            for (const std::string& kind : tree)
                if (kind == "stop")
                    run.say(kind);
                else if (kind == "ignore")
                    run.ask(kind);
                else
                    all.push_back(run.make(kind));
        }
        for (std::size_t i = 0; i < trees.size(); ++i)
            byItself&& trees[i] != trees.back() ? runs[i].say("exit") : host.end(runs[i]);
        for (std::size_t i = 0; i < trees.size(); ++i) {
            ASSERT_TRUE(runs[i].ended.comes()) << testing::PrintToString(trees[i]);
            for (const Other& each : processes[i])
                EXPECT_FALSE(each.isThere()) << testing::PrintToString(trees[i]);
            host.end(runs[i]); // of no consequence
        }
    }
    EXPECT_EQ(childrenOf(host.launcherPid()), "");
}

TEST(LauncherTest, aDeadLauncherTakesAllWithItAndIsStartedAgain) {
    Host host;
    for (int round = 0; round < 2; ++round) {
        Launched first = host.start();
        Launched second = host.start();
        const Other trees[] = {Other(first.started()->pid), first.make("orphan"),
                               first.make("session orphan"), Other(second.started()->pid)};
        const pid_t launcher = host.launcherPid();
        ::kill(launcher, SIGKILL);
        const Launched meanwhile = host.launch(host.usual());
        EXPECT_TRUE(first.ended.comes());
        EXPECT_TRUE(second.ended.comes());
        for (const Other& each : trees)
            EXPECT_FALSE(each.isThere());
        // It may have been lost with the dead one, or have waited for the next.
        EXPECT_TRUE(meanwhile.started() || meanwhile.error()->code == ECONNRESET);
        (void)host.start();
        EXPECT_NE(host.launcherPid(), launcher);
    }
}

// Instead of the launcher: nothing, a program that ends at once, and one that talks nonsense.
TEST(LauncherTest, withoutALauncherALaunchFails) {
    for (const auto& [program, error] :
         {std::pair(std::string("/nonexistent"), ENOENT),
          std::pair(std::string("/bin/true"), ECONNRESET),
          std::pair(Host::programs() + "/launcher_probe", ECONNRESET)}) {
        Host host(program);
        const Launched run = host.launch(host.usual());
        ASSERT_TRUE(run.error()) << program;
        EXPECT_EQ(run.error()->code, error) << describe(*run.error());
    }
}

TEST(LauncherTest, theLauncherEndsOnAnOrderThatMeansNothing) {
    const auto frame = [](ipc::FrameKind kind, const Dictionary& message) {
        return std::string(ipc::FrameText(kind, 0, message).text());
    };
    const auto order = [&](const Dictionary& message) {
        return frame(ipc::FrameKind::oneWay, message);
    };
    const Dictionary launch{{"launch", 1U},
                            {"path", "/bin/true"},
                            {"environment", Dictionary()},
                            {"profile", "plugin"},
                            {"bundle", "/"}};
    auto asRoot = launch;
    asRoot.set("user", 0U);
    auto numbered = launch;
    numbered.set("path", 5);

    const struct {
        std::string bytes;
        bool ends = true;
    } cases[] = {
        {order({{"end", 1U}}), false}, // one that is gone
        {order(launch).substr(0, 40), false},
        {order(launch)}, // without descriptors
        {order(asRoot)},
        {order(numbered)},
        {order({{"end", "1"}})},
        {order({})},
        {frame(ipc::FrameKind::request, {{"end", 1U}})},
        {std::string(100, 'x')},
        {order(launch).replace(20, 4, "\xff\xff\xff\xff")},
    };

    for (const auto& each : cases) {
        auto launcher = platform::launcher::startLauncher(Host::programs() + "/zpd-launcher");
        ASSERT_TRUE(launcher) << describe(launcher.error());
        Other process(launcher->pid);
        ::send(launcher->socket.get(), each.bytes.data(), each.bytes.size(), MSG_NOSIGNAL);
        if (!each.ends) {
            ::usleep(20'000);
            EXPECT_TRUE(process.isThere());
            launcher->socket.reset();
        }
        EXPECT_TRUE(process.vanishes()) << testing::PrintToString(each.bytes);
    }
}

TEST(LauncherTest, aHundredStartsLeaveNothing) {
    Host host;
    const Launched first = host.start(); // what is made once is there
    const int launchers = descriptorsOf(host.launcherPid());
    const int own = descriptorsOf(::getpid());
    for (int round = 0; round < 10; ++round) {
        std::vector<Launched> runs;
        for (int i = 0; i < 10; ++i)
            runs.push_back(host.launch(host.usual()));
        for (Launched& run : runs) {
            EXPECT_TRUE(run.started());
            host.end(run);
        }
        for (const Launched& run : runs)
            EXPECT_TRUE(run.ended.comes());
    }
    EXPECT_EQ(descriptorsOf(host.launcherPid()), launchers);
    EXPECT_EQ(descriptorsOf(::getpid()), own);
}

// Which differs most: no user of its own, nothing that only root may do.
TEST(LauncherTest, allOfItHoldsForAnOrdinaryUserToo) {
    if (!isRoot())
        return; // it was seen already
    constexpr uid_t ordinary = 12345;
    const pid_t child = ::fork();
    if (child == 0) {
        if (::setgroups(0, nullptr) == 0 && ::setresgid(ordinary, ordinary, ordinary) == 0 &&
            ::setresuid(ordinary, ordinary, ordinary) == 0)
            ::execl("/proc/self/exe", "test_launcher", "--gtest_filter=-*OrdinaryUser*", nullptr);
        ::_exit(1);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}
