// zpctl's verbs that change something, with the real daemon.

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

using testing::AllOf;
using testing::HasSubstr;

// The tool on a home, as a person starts it.
class Tool {
public:
    explicit Tool(const Home& home) : home_(home) {}

    [[nodiscard]] Program start(const std::vector<std::string>& words, int output = -1,
                                const std::string& program = builtProgram("zpctl")) const {
        std::vector<std::string> command = {program, "--service", "e2e"};
        command.insert(command.end(), words.begin(), words.end());
        std::filesystem::remove(home_ / "errors");
        return Program({.command = command,
                        .settings = {{"ZEPHRIN_HOME", home_.path()}, {"TZ", "UTC"}},
                        .errorFile = home_ / "errors",
                        .outputFile = home_ / "output",
                        .outputFd = output});
    }

    // "STATUS OUTPUT ERRORS".
    [[nodiscard]] std::string run(const std::vector<std::string>& words,
                                  const std::string& program = builtProgram("zpctl")) const {
        const int status = start(words, -1, program).exitStatus();
        return std::to_string(status) + " " + output() + readFile(home_ / "errors");
    }

    [[nodiscard]] std::string output() const { return readFile(home_ / "output"); }

private:
    const Home& home_;
};

std::string uuidAt(const Daemon& daemon, const std::string& path) {
    WireClient client = daemon.connect();
    return findAt(client, path)["uuid"].text();
}

TEST(Tool, ChangesWhatTheDaemonKeeps) {
    const Home home;
    const std::string plugIn = addAppWith(home, "Some", {.identifier = "some"});
    addPlugIn(home.addApp("Away", "elsewhere"), "Away", {.identifier = "away"});
    const Daemon daemon(home.path());
    const Tool tool(home);
    const std::string uuid = uuidAt(daemon, plugIn);

    const struct {
        const char* choice;
        const char* tree;
    } elections[] = {{"on", "  elected  "}, {"off", "  not elected  "}, {"default", "widget  "}};

    for (const auto& [choice, tree] : elections) {
        EXPECT_THAT(tool.run({"elect", uuid, choice}), testing::StartsWith("0 " + uuid));
        EXPECT_THAT(tool.run({"tree"}), HasSubstr(tree + uuid)) << choice;
    }
    writeFile(home / "annotation.plist", xmlPlist(Item::map({{"extension", "no dictionary"}})));
    EXPECT_EQ(tool.run({"annotate", uuid, home / "annotation.plist"}),
              "1 zpctl: invalid request format (annotation extension) (code 4)\n");
    writeFile(home / "annotation.plist",
              xmlPlist(Item::map({{"extension", Item::map({{"some", "settings"}})}})));
    EXPECT_EQ(tool.run({"annotate", uuid, home / "annotation.plist"}),
              "0 " + uuid + " is annotated\n");
    EXPECT_THAT(tool.run({"--json", "find", uuid}), HasSubstr("\"some\": \"settings\""));

    const std::string away = home / "elsewhere/Away.app/PlugIns/Away.appex";
    EXPECT_EQ(tool.run({"add", away, home / "nowhere"}),
              "1 zpctl: invalid plugin path: " + (home / "nowhere") + " (code 9)\n");
    EXPECT_THAT(tool.run({"match", "--flags", "1"}), AllOf(HasSubstr("some"), HasSubstr("away")));
    EXPECT_THAT(tool.run({"remove", away}), testing::StartsWith("1 zpctl: caller lacks"));
    const std::string manager = addProgram(home / "bin/manager", "zpctl");
    Signer(home).sign(manager);
    std::filesystem::create_directories(home / "lib");
    const char* library = "lib/libZephrin.so.0";
    std::filesystem::copy_file(builtProgram("../") + library, home / library);
    EXPECT_EQ(tool.run({"remove", away}, manager), "0 1 plug-in unregistered\n");
    EXPECT_THAT(tool.run({"match", "--flags", "1"}), testing::Not(HasSubstr("away")));
}

// All of an application's plug-ins change at once, for everybody who asks.
TEST(Tool, InstallsOverAnApplicationInOneStepForClients) {
    constexpr int plugIns = 8;
    const Home home;
    const auto source = [&](const std::string& version) {
        const std::string app = home.addApp("Some", "source" + version);
        for (int i = 0; i < plugIns; ++i)
            addPlugIn(app, "P" + std::to_string(i),
                      {.identifier = "p" + std::to_string(i), .version = version});
        return app;
    };
    const std::string sources[] = {source("1"), source("2")};
    const Tool tool(home);
    ASSERT_THAT(tool.run({"install", sources[0]}), testing::StartsWith("0 "));
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    for (int change = 1; change <= 6; ++change) {
        Program install = tool.start({"install", sources[change % 2]});
        const std::string wanted = change % 2 == 0 ? "1" : "2";
        const auto arrived = [&] {
            int found = 0;
            int old = 0;
            for (const Item& form : match(client, Item::map({}), 1)) {
                ++found;
                old += form["version"].text() == wanted ? 0 : 1;
            }
            EXPECT_EQ(found, plugIns) << "change " << change;
            EXPECT_TRUE(old == 0 || old == plugIns) << "change " << change << ": " << old;
            return old == 0 || testing::Test::HasFailure();
        };
        ASSERT_TRUE(eventually(arrived)) << "change " << change;
        EXPECT_EQ(install.exitStatus(), 0) << install.errors();
    }
}

TEST(Tool, MonitorTellsOfChangesAndEndsWell) {
    const Home home;
    const std::string plugIn = addAppWith(home, "Some", {.identifier = "some"});
    const Tool tool(home);
    const auto waits = [](const Program& monitor) {
        return eventually(
            [&] { return monitor.errors().find("waiting for") != std::string::npos; });
    };
    const auto lines = [&] {
        const std::string output = tool.output();
        return std::ranges::count(output, '\n');
    };
    Program monitor = tool.start({"--json", "monitor"}); // before there is a daemon
    ASSERT_TRUE(waits(monitor));
    std::optional<Daemon> daemon(std::in_place, home.path());
    const auto elect = [&] {
        WireClient elector = daemon->connect();
        const Item uuid = Item::uuid(findAt(elector, plugIn)["uuid"].text());
        elector.request(
            envelope("annotate", Item::map({{"uuids", Item::array({uuid})},
                                            {"annotations", Item::map({{"election", Item(1)}})}})));
    };
    for (int changes = 1; changes <= 3; ++changes) {
        elect();
        EXPECT_TRUE(eventually([&] { return lines() == changes; })) << tool.output();
    }
    EXPECT_THAT(tool.output(),
                HasSubstr("Z\",\"notification\":\"com.tovana.zephrin.annotation-change\"}\n"));
    daemon->program().signal(SIGKILL);
    daemon->program().exitStatus();
    std::filesystem::remove_all(home / "run");
    daemon.emplace(home.path()); // counts from the beginning
    elect();
    EXPECT_TRUE(eventually([&] { return lines() == 4; })) << tool.output();
    monitor.signal(SIGTERM);
    EXPECT_EQ(monitor.exitStatus(), 0);

    int ends[2];
    ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
    Program unread = tool.start({"monitor"}, ends[1]);
    ::close(ends[1]);
    EXPECT_TRUE(waits(unread));
    EXPECT_TRUE(unread.running());
    ::close(ends[0]);
    EXPECT_EQ(unread.exitStatus(), 0) << "its reader is gone";

    Program counted = tool.start({"monitor", "--count", "1"});
    ASSERT_TRUE(waits(counted));
    elect();
    EXPECT_EQ(counted.exitStatus(), 0);
    EXPECT_EQ(lines(), 1);
}

} // namespace
} // namespace e2e
