// zpctl's verbs that change something, with the real daemon.

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

using testing::AllOf;
using testing::HasSubstr;

// The tool, as a person starts it.
class Tool : public DaemonTest {
protected:
    [[nodiscard]] Program begin(const std::vector<std::string>& words, int outputFd = -1,
                                const std::string& program = builtProgram("zpctl")) const {
        std::vector<std::string> command = {program, "--service", "e2e"};
        command.insert(command.end(), words.begin(), words.end());
        fs::remove(home / "errors");
        return Program({.command = command,
                        .settings = {{"ZEPHRIN_HOME", home.path()}, {"TZ", "UTC"}},
                        .errorFile = home / "errors",
                        .inputFile = fs::exists(input) ? input : "/dev/null",
                        .outputFile = home / "output",
                        .outputFd = outputFd});
    }

    // "STATUS OUTPUT ERRORS".
    [[nodiscard]] std::string run(const std::vector<std::string>& words,
                                  const std::string& program = builtProgram("zpctl")) const {
        const int status = begin(words, -1, program).exitStatus();
        return std::to_string(status) + " " + output() + readFile(home / "errors");
    }

    [[nodiscard]] std::string output() const { return readFile(home / "output"); }

    // A plug-in that answers lines, and its UUID.
    [[nodiscard]] std::string addTalker() {
        addProgram(addAppWith(home, "Some", {.identifier = "some"}) + "/plugin", "launcher_probe");
        start();
        return uuidAt(talker);
    }

    const std::string input = home / "input"; // where there is one
    const std::string talker = home / "Applications/Some.app/PlugIns/Some.appex";

    [[nodiscard]] std::string uuidAt(const std::string& path) {
        return findAt(*client, path)["uuid"].text();
    }
};

TEST_F(Tool, ChangesWhatTheDaemonKeeps) {
    const std::string plugIn = addAppWith(home, "Some", {.identifier = "some"});
    const std::string away = addAppWith(home, "Away", {.identifier = "away"}, "elsewhere");
    start();
    const std::string uuid = uuidAt(plugIn);
    const std::pair<const char*, const char*> elections[] = {
        {"on", "  elected  "}, {"off", "  not elected  "}, {"default", "widget  "}};
    for (const auto& [choice, tree] : elections) {
        EXPECT_THAT(run({"elect", uuid, choice}), testing::StartsWith("0 " + uuid));
        EXPECT_THAT(run({"tree"}), HasSubstr(tree + uuid)) << choice;
    }
    const auto annotate = [&](const Item& extension) {
        const std::string file = home / "annotation.plist";
        writeFile(file, xmlPlist(Item::map({{"extension", extension}})));
        return run({"annotate", uuid, file});
    };
    EXPECT_EQ(annotate("no dictionary"),
              "1 zpctl: invalid request format (annotation extension) (code 4)\n");
    EXPECT_EQ(annotate(Item::map({{"some", "settings"}})), "0 " + uuid + " is annotated\n");
    EXPECT_THAT(run({"--json", "find", uuid}), HasSubstr("\"some\": \"settings\""));

    EXPECT_EQ(run({"add", away, home / "nowhere"}),
              "1 zpctl: invalid plugin path: " + (home / "nowhere") + " (code 9)\n");
    EXPECT_THAT(run({"match", "--flags", "1"}), AllOf(HasSubstr("some"), HasSubstr("away")));
    EXPECT_THAT(run({"remove", away}), testing::StartsWith("1 zpctl: caller lacks"));
    const std::string manager = addProgram(home / "bin/manager", "zpctl");
    Signer(home).sign(manager);
    (void)addProgram(home / "lib/libZephrin.so.0", "../lib/libZephrin.so.0");
    EXPECT_EQ(run({"remove", away}, manager), "0 1 plug-in unregistered\n");
    EXPECT_THAT(run({"match", "--flags", "1"}), testing::Not(HasSubstr("away")));
    daemon->program().signal(SIGSTOP);
    EXPECT_EQ(run({"--timeout", "0.2", "tree"}),
              "3 zpctl: the daemon did not answer within 0.2 s\n");
}

// All of an application's plug-ins change at once, for everybody who asks.
TEST_F(Tool, InstallsOverAnApplicationInOneStepForClients) {
    const std::vector<std::string> identifiers = {"a", "b", "c", "d", "e", "f", "g", "h"};
    const auto source = [&](const std::string& version) {
        const std::string app = home.addApp("Some", "source" + version);
        for (const std::string& identifier : identifiers)
            addPlugIn(app, identifier, {.identifier = identifier, .version = version});
        return app;
    };
    const std::string sources[] = {source("1"), source("2")};
    ASSERT_THAT(run({"install", sources[0]}), testing::StartsWith("0 "));
    start();
    for (int change = 1; change <= 6; ++change) {
        SCOPED_TRACE(change);
        Program install = begin({"install", sources[change % 2]});
        const Item wanted = change % 2 == 0 ? "1" : "2";
        const auto arrived = [&] {
            const std::vector<Item> found = match(*client, Item::map({}), 1);
            EXPECT_EQ(found.size(), identifiers.size());
            const auto fresh = static_cast<std::size_t>(std::ranges::count_if(
                found, [&](const Item& form) { return form["version"] == wanted; }));
            EXPECT_TRUE(fresh == 0 || fresh == found.size()) << fresh;
            return fresh != 0 || HasFailure();
        };
        ASSERT_TRUE(eventually(arrived));
        EXPECT_EQ(install.exitStatus(), 0) << install.errors();
    }
}

TEST_F(Tool, MonitorTellsOfChangesAndEndsWell) {
    const std::string plugIn = addAppWith(home, "Some", {.identifier = "some"});
    const auto waits = [](const Program& monitor) {
        return eventually(
            [&] { return monitor.errors().find("waiting for") != std::string::npos; });
    };
    const auto lines = [&] {
        const std::string text = output();
        return std::ranges::count(text, '\n');
    };
    Program monitor = begin({"--json", "monitor"}); // before there is a daemon
    ASSERT_TRUE(waits(monitor));
    start();
    const auto elect = [&] {
        const Item uuids = Item::array({Item::uuid(uuidAt(plugIn))});
        const Item annotation = Item::map({{"election", 1}});
        client->request(
            envelope("annotate", Item::map({{"uuids", uuids}, {"annotations", annotation}})));
    };
    for (int changes = 1; changes <= 3; ++changes) {
        elect();
        EXPECT_TRUE(eventually([&] { return lines() == changes; })) << output();
    }
    EXPECT_THAT(output(),
                HasSubstr("Z\",\"notification\":\"com.tovana.zephrin.annotation-change\"}\n"));
    kill();
    fs::remove_all(home / "run");
    start(); // counts from the beginning
    elect();
    EXPECT_TRUE(eventually([&] { return lines() == 4; })) << output();
    monitor.signal(SIGTERM);
    EXPECT_EQ(monitor.exitStatus(), 0);

    int ends[2];
    ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
    Program unread = begin({"monitor"}, ends[1]);
    ::close(ends[1]);
    EXPECT_TRUE(waits(unread));
    EXPECT_TRUE(unread.running());
    ::close(ends[0]);
    EXPECT_EQ(unread.exitStatus(), 0) << "its reader is gone";

    Program counted = begin({"monitor", "--count", "1"});
    ASSERT_TRUE(waits(counted));
    elect();
    EXPECT_EQ(counted.exitStatus(), 0);
    EXPECT_EQ(lines(), 1);
}

TEST_F(Tool, RunsAPlugInUntilItHangsUp) {
    const std::string uuid = addTalker();
    writeFile(input, "descriptors\nexit\n");
    EXPECT_EQ(run({"run", uuid}), "0 ready\n0:null 1:null 2:null 3:socket\n");
    EXPECT_THAT(run({"run", uuid, "--env", "A=B"}),
                testing::StartsWith("1 zpctl: Transmission of environment variables requires the"));
    EXPECT_THAT(run({"access", uuid}), HasSubstr(uuid + "  zsx1;"));

    const int full = ::open("/dev/full", O_WRONLY | O_CLOEXEC);
    Program unwritten = begin({"run", uuid}, full);
    EXPECT_EQ(unwritten.exitStatus(), 1);
    EXPECT_EQ(unwritten.errors(), "zpctl: standard output: No space left on device\n");
    ::close(full);
    const std::string withoutOutput = "exec \"$0\" --service e2e run \"$1\" >&-";
    Program closed({.command = {"/bin/sh", "-c", withoutOutput, builtProgram("zpctl"), uuid},
                    .settings = {{"ZEPHRIN_HOME", home.path()}},
                    .errorFile = home / "closed",
                    .inputFile = input,
                    .outputFile = home / "output"});
    EXPECT_EQ(closed.exitStatus(), 1) << "no socket takes its place";
    EXPECT_EQ(closed.errors(), "zpctl: standard output: Bad file descriptor\n");

    fs::remove(input);
    ASSERT_EQ(::mkfifo(input.c_str(), 0600), 0);
    const int silent = ::open(input.c_str(), O_RDWR | O_CLOEXEC);
    int ends[2];
    ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
    Program talk = begin({"run", uuid}, ends[1]);
    char said[6];
    ASSERT_EQ(::read(ends[0], said, sizeof said), 6);
    const std::string host = std::to_string(talk.pid()) + " " + builtProgram("zpctl");
    EXPECT_THAT(run({"ps"}), AllOf(HasSubstr("some"), HasSubstr("  plugin  "), HasSubstr(host),
                                   HasSubstr("\n1 plug-in running\n")));
    EXPECT_THAT(run({"--json", "hold", "--refuse-busy", talker, "--", "true"}),
                AllOf(testing::StartsWith("1 "), HasSubstr("\"code\": 14"),
                      HasSubstr("\"conflicts\": [\n      \"some\"\n")));
    talk.signal(SIGINT);
    EXPECT_EQ(talk.exitStatus(), 128 + SIGINT);
    EXPECT_TRUE(eventually([&] { return run({"ps"}) == "0 0 plug-ins running\n"; }));
    for (const int each : {silent, ends[0], ends[1]})
        ::close(each);
}

TEST_F(Tool, HoldsWhileACommandRuns) {
    const std::string uuid = addTalker();
    const std::string denied = "access to plugin some denied: the plug-in is on hold (code 11)\n";
    const std::pair<std::vector<std::string>, std::string> cases[] = {
        {{"sh", "-c", "echo done; exit 7"}, "7 done\n"},
        {{"sh", "-c", "kill -9 $$"}, "137 "},
        {{"no-such-command"}, "127 zpctl: no-such-command: No such file or directory\n"},
        {{"/etc/passwd"}, "126 zpctl: /etc/passwd: Permission denied\n"},
        {{builtProgram("zpctl"), "--service", "e2e", "ready", uuid}, "1 zpctl: " + denied},
    };
    for (const auto& [command, result] : cases) {
        std::vector<std::string> words = {"hold", "--app", home / "Applications/Some.app", "--"};
        words.insert(words.end(), command.begin(), command.end());
        EXPECT_EQ(run(words), result);
        EXPECT_EQ(run({"ready", uuid}), "0 " + uuid + " can be launched\n");
    }

    Program stubborn = begin({"hold", talker, "--", "sh", "-c",
                              "trap 'exit 9' TERM; echo on; while :; do sleep 0.05; done"});
    ASSERT_TRUE(eventually([&] { return output() == "on\n"; }));
    stubborn.signal(SIGTERM);
    EXPECT_EQ(stubborn.exitStatus(), 9) << "the command was told";

    Program hold = begin({"hold", talker});
    ASSERT_TRUE(eventually([&] { return output().ends_with(talker + "\n"); }));
    const std::string token = output().substr(std::string("holding by token ").size(), 36);
    EXPECT_EQ(run({"ready", uuid}), "1 zpctl: " + denied);
    EXPECT_THAT(run({"release", token}), testing::StartsWith("0 no hold by token " + token));
    EXPECT_EQ(run({"ready", uuid}), "0 " + uuid + " can be launched\n");
    hold.signal(SIGINT);
    EXPECT_EQ(hold.exitStatus(), 0);
}

TEST_F(Tool, SaysThatAHoldEndedWithTheDaemon) {
    (void)addTalker();
    Program idle = begin({"hold", talker});
    ASSERT_TRUE(eventually([&] { return output().ends_with(talker + "\n"); }));
    kill();
    EXPECT_EQ(idle.exitStatus(), 3);
    EXPECT_EQ(idle.errors(), "zpctl: the daemon ended, and the hold with it\n");
    start();
    const std::string mark = home / "mark";
    Program busy = begin({"hold", talker, "--", "sh", "-c",
                          "echo on; until [ -e \"$0\" ]; do sleep 0.05; done; exit 5", mark});
    ASSERT_TRUE(eventually([&] { return output() == "on\n"; }));
    kill();
    start(); // which knows nothing of the hold
    writeFile(mark, "");
    EXPECT_EQ(busy.exitStatus(), 5);
    EXPECT_EQ(busy.errors(), "zpctl: note: the daemon ended, and the hold with it\n");
}

} // namespace
} // namespace e2e
