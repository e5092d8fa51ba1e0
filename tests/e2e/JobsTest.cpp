// Plug-ins as processes: a host makes one ready, starts it, talks to it; and when it ends.

#include <atomic>
#include <csignal>
#include <functional>
#include <sstream>
#include <thread>
#include <unistd.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr const char* identifier = "com.example.worker";

bool isThere(pid_t pid) {
    return kill(pid, 0) == 0;
}

bool vanishes(pid_t pid) {
    return eventually([&] { return !isThere(pid); });
}

std::size_t entriesOf(pid_t pid, const char* folder) {
    const fs::directory_iterator all("/proc/" + std::to_string(pid) + "/" + folder);
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

std::vector<pid_t> childrenOf(pid_t pid) {
    const std::string number = std::to_string(pid);
    std::vector<pid_t> children;
    for (const auto& task : fs::directory_iterator("/proc/" + number + "/task")) {
        std::istringstream text(readFile(task.path().string() + "/children"));
        for (pid_t child = 0; text >> child;)
            children.push_back(child);
    }
    return children;
}

class Jobs : public DaemonTest {
protected:
    Jobs() { addProgram(bundle + "/plugin", "launcher_probe"); }

    // A host, for which the plug-in is ready.
    [[nodiscard]] std::unique_ptr<Talk> host(const std::vector<std::string>& more = {}) {
        auto made = hostAlone(more);
        EXPECT_EQ(makeReady(*made), "");
        return made;
    }

    [[nodiscard]] std::unique_ptr<Talk> hostAlone(const std::vector<std::string>& more = {}) const {
        std::vector<std::string> command = {builtProgram("e2e_host_probe"), "e2e"};
        command.insert(command.end(), more.begin(), more.end());
        return std::make_unique<Talk>(home, command);
    }

    [[nodiscard]] std::string makeReady(Talk& host) {
        return host.ask("ready " + findAt(*client, bundle)["uuid"].text());
    }

    static std::string startIn(Talk& host) { return host.ask(std::string("start ") + identifier); }

    static pid_t pidFrom(const std::string& line) { return std::stoi(line); }

    [[nodiscard]] pid_t launcher() const {
        const auto children = childrenOf(daemon->pid());
        return children.size() == 1 ? children.front() : 0;
    }

    // Holds the plug-in, all its processes ended; answers the token.
    [[nodiscard]] Item hold() {
        const Item held = client->request(
            envelope("lock", Item::map({{"paths", Item::array({bundle})}, {"flags", 5}})));
        EXPECT_EQ(errorOf(held), "");
        return held["uuids"];
    }

    void release(const Item& token) {
        EXPECT_EQ(answer(envelope("lock", Item::map({{"uuids", Item::array({token})}}))), "");
    }

    void terminate() {
        const Item token = hold();
        expectGone();
        release(token);
    }

    // At the moment of a reply.
    void expectGone() {
        for (const pid_t pid : mustBeGone)
            EXPECT_FALSE(isThere(pid)) << pid;
        mustBeGone.clear();
    }

    const std::string bundle = addAppWith(home, "Some", {.identifier = identifier});
    std::vector<pid_t> mustBeGone;
};

TEST_F(Jobs, AHostStartsWhatIsReadyAndTalksToIt) {
    start();
    const auto one = host();
    EXPECT_EQ(startIn(*one), "ready");
    const std::string variables = one->ask("ask environment");
    for (const char* name : {"HOME=", "TMPDIR=", "ZEPHRIN_SOCKET=3"})
        EXPECT_NE(variables.find(name), std::string::npos) << variables;
    EXPECT_EQ(variables.find("ZEPHRIN_HOME"), std::string::npos);
    EXPECT_EQ(one->ask("ask descriptors"), "0:null 1:null 2:null 3:socket");
    EXPECT_EQ(one->ask("list"), std::string(identifier) + " plugin " + one->ask("pid") + " " +
                                    std::to_string(one->program().pid()) + " ");
    const auto other = hostAlone();
    EXPECT_EQ(startIn(*other), "15 plug-in com.example.worker was not made ready for this process");
}

TEST_F(Jobs, AnInstanceGoesWithAllThatCameFromItBeforeTheReply) {
    start();
    const auto one = host();
    ASSERT_EQ(startIn(*one), "ready");
    ASSERT_EQ(one->ask("ask ignore"), "ignoring");
    for (const char* kind : {"child", "stubborn", "session", "orphan", "session orphan"})
        mustBeGone.push_back(pidFrom(one->ask(std::string("ask ") + kind)));
    mustBeGone.push_back(pidFrom(one->ask("pid")));
    for (const pid_t pid : mustBeGone)
        ASSERT_TRUE(isThere(pid));
    terminate();
    EXPECT_EQ(startIn(*one).substr(0, 3), "15 ") << "it is to be made ready again";
    EXPECT_EQ(makeReady(*one), "");
    EXPECT_EQ(startIn(*one), "ready");
}

TEST_F(Jobs, WhoeverEndsTakesTheirInstancesAlong) {
    start();
    auto one = host();
    const auto two = host();
    ASSERT_EQ(startIn(*one), "ready");
    ASSERT_EQ(startIn(*two), "ready");
    const pid_t ofOne = pidFrom(one->ask("pid"));
    const pid_t child = pidFrom(one->ask("ask session orphan"));
    one->program().signal(SIGKILL);
    EXPECT_TRUE(vanishes(ofOne) && vanishes(child));
    EXPECT_EQ(two->ask("ask signals"), "");

    const pid_t ofTwo = pidFrom(two->ask("pid"));
    const pid_t before = launcher();
    ASSERT_GT(before, 1);
    ASSERT_EQ(::kill(before, SIGKILL), 0);
    EXPECT_TRUE(vanishes(ofTwo) && vanishes(before));
    ASSERT_EQ(startIn(*two), "ready") << "by another launcher";
    EXPECT_NE(launcher(), before);

    const pid_t last = pidFrom(two->ask("pid"));
    const pid_t stubborn = pidFrom(two->ask("ask session"));
    const pid_t itsLauncher = launcher();
    kill();
    EXPECT_TRUE(vanishes(last) && vanishes(stubborn) && vanishes(itsLauncher));
}

TEST_F(Jobs, ManyStartsAndTerminationsLeaveNothing) {
    constexpr int rounds = 50;
    constexpr int each = 4;
    start();
    const auto one = host();
    const auto round = [&] {
        ASSERT_EQ(makeReady(*one), "");
        for (int i = 0; i < each; ++i) {
            ASSERT_EQ(startIn(*one), "ready");
            mustBeGone.push_back(pidFrom(one->ask("pid")));
        }
        terminate();
    };
    const auto amounts = [&] {
        return std::vector{entriesOf(daemon->pid(), "fd"), entriesOf(daemon->pid(), "task"),
                           entriesOf(launcher(), "fd"),    entriesOf(launcher(), "task"),
                           childrenOf(launcher()).size(),  childrenOf(daemon->pid()).size()};
    };
    round();
    const auto before = amounts();
    for (int i = 0; i < rounds; ++i)
        ASSERT_NO_FATAL_FAILURE(round());
    EXPECT_TRUE(eventually([&] { return amounts() == before; }));
    EXPECT_EQ(amounts(), before);
}

TEST_F(Jobs, AFileThatWasSwappedIsNotRun) {
    start();
    const auto one = host();
    addProgram(bundle + "/other", "launcher_probe");
    fs::rename(bundle + "/other", bundle + "/plugin");
    EXPECT_EQ(startIn(*one), "4 the executable of plug-in com.example.worker has changed since it "
                             "was made ready");
    EXPECT_TRUE(eventually([&] { return makeReady(*one).empty() && startIn(*one) == "ready"; }));
}

TEST_F(Jobs, NothingRunsAtTheReplyHoweverManyAreStartedMeanwhile) {
    constexpr int rounds = 40;
    start();
    const std::string ready = "ready " + findAt(*client, bundle)["uuid"].text();
    std::atomic<bool> over = false;
    const auto hammer = [&](Talk& host) {
        while (!over) {
            if (host.ask(ready).empty())
                (void)startIn(host);
        }
    };
    const auto one = hostAlone();
    const auto two = hostAlone();
    std::thread first(hammer, std::ref(*one));
    std::thread second(hammer, std::ref(*two));
    for (int i = 0; i < rounds; ++i) {
        const Item token = hold();
        EXPECT_TRUE(childrenOf(launcher()).empty());
        release(token);
    }
    over = true;
    first.join();
    second.join();
}

// While the daemon stands still, the host goes and another process comes with its pid.
TEST_F(Jobs, AReusedPidIsNotTheHost) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can choose a pid";
    start();
    const auto first = host();
    const pid_t pid = first->program().pid();
    ASSERT_EQ(startIn(*first), "ready");
    const pid_t plugIn = pidFrom(first->ask("pid"));
    daemon->program().signal(SIGSTOP);
    first->program().signal(SIGKILL);
    first->program().exitStatus();
    const auto second = hostAlone({std::to_string(pid)});
    second->tell(std::string("start ") + identifier);
    ASSERT_TRUE(eventually([&] { return isThere(pid); }));
    std::this_thread::sleep_for(200ms); // it has connected by now, or does so later
    daemon->program().signal(SIGCONT);
    EXPECT_EQ(second->hear(), "15 plug-in com.example.worker was not made ready for this process");
    EXPECT_TRUE(vanishes(plugIn));
    EXPECT_EQ(makeReady(*second), "");
    EXPECT_EQ(startIn(*second), "ready");
    EXPECT_NE(second->ask("list").find(" " + std::to_string(pid) + " "), std::string::npos);
}

} // namespace
} // namespace e2e
