// zpctl's verbs that change something, with the real daemon.

#include <algorithm>
#include <csignal>
#include <fcntl.h>
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

} // namespace
} // namespace e2e
