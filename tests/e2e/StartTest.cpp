#include <algorithm>
#include <csignal>
#include <filesystem>
#include <sys/stat.h>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

const char* const usage = "Usage: zpd [-S servicename] [-v]\n";

Program runZpd(const Home& home, std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), builtProgram("zpd"));
    fs::remove(home / "errors");
    return Program({.command = arguments,
                    .settings = {{"ZEPHRIN_HOME", home.path()}},
                    .errorFile = home / "errors"});
}

TEST(Start, WrongOptionsPrintTheUsageAndNothingElse) {
    const Home home;
    const std::vector<std::vector<std::string>> cases = {
        {"extra"}, {"-x"}, {"-S"}, {"-c"}, {"--help"}, {"-vx"}, {"--", "extra"}, {"-v", "x"}};
    for (const std::vector<std::string>& arguments : cases) {
        SCOPED_TRACE(arguments[0]);
        Program program = runZpd(home, arguments);
        EXPECT_EQ(program.exitStatus(), 2);
        std::string errors = program.errors();
        const std::size_t at = errors.find(usage);
        ASSERT_NE(at, std::string::npos) << errors;
        errors.erase(at, std::string_view(usage).size());
        // Only what -v says may stand beside it.
        const bool verbose = arguments[0].starts_with("-v");
        EXPECT_EQ(std::count(errors.begin(), errors.end(), '\n'), verbose ? 1 : 0) << errors;
        EXPECT_FALSE(fs::exists(home / "run"));
    }
}

TEST(Start, SaysThatVerboseHasNoEffect) {
    const Home home;
    Daemon daemon(home.path(), {.arguments = {"-v", "-vv"}});
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_EQ(daemon.linesWith("default error: verbose option -v is ineffective; use log config "
                               "--subsystem com.tovana.zephrin"),
              3u);
    EXPECT_EQ(daemon.linesWith("ops info: zpd is launching"), 1u);
}

TEST(Start, TheLastCacheLimitIsKept) {
    const Home home;
    const std::string app = home.addApp("Some");
    for (const char* identifier : {"a", "b", "c", "d"})
        addPlugIn(app, identifier, {.identifier = identifier});
    Daemon daemon(home.path(), {.arguments = {"-c", "9", "-c", "2abc"}});
    WireClient client = daemon.connect();
    // Each time the whole cache goes before the fourth record, and nothing before comes again.
    for (const std::size_t times : {1U, 2U}) {
        EXPECT_EQ(matched(client, Item::map({})), "a b c d");
        EXPECT_TRUE(eventually(
            [&] { return daemon.linesWith("default: createPlugInForProxy") == 4 * times; }));
        EXPECT_EQ(daemon.linesWith("ops info: purging cache for 3 > 2"), times);
    }
}

TEST(Start, TerminationIsOrderly) {
    const Home home;
    Daemon daemon(home.path());
    WireClient client = daemon.connect();
    for (int i = 0; i < 100; ++i)
        client.post(envelope("match"));
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_TRUE(client.ended());
    EXPECT_EQ(daemon.linesWith(" error: "), 0u);
}

TEST(Start, ASecondDaemonOnALiveNameFails) {
    const Home home;
    addAppWith(home, "A", {.identifier = "a"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    Program second = runZpd(home, {"-S", "e2e", "-d", home / "annotations"});
    EXPECT_EQ(second.exitStatus(), 1);
    EXPECT_NE(second.errors().find("ops error: unable to construct server"), std::string::npos)
        << second.errors();
    // Under another name it lives beside the first one, which keeps its database to itself.
    const Daemon third(home.path(), {.service = "another"});
    EXPECT_TRUE(third.logs("another daemon uses "));
    WireClient other = third.connect();
    EXPECT_EQ(matched(other, Item::map({})), "a");
    EXPECT_EQ(matched(client, Item::map({})), "a");
    WireClient later = daemon.connect();
    EXPECT_EQ(matched(later, Item::map({})), "a");
}

TEST(Start, AStaleSocketIsReplaced) {
    const Home home;
    for (int i = 0; i < 2; ++i) {
        Daemon daemon(home.path());
        daemon.program().signal(SIGKILL);
        daemon.program().exitStatus();
        EXPECT_TRUE(fs::is_socket(daemon.socketPath()));
    }
    Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "");
    struct stat status{};
    ASSERT_EQ(stat(daemon.socketPath().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777u, 0666u);
    ASSERT_EQ(stat((home / "run").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777u, 0755u);
}

TEST(Start, ASocketPathThatIsTooLongIsAClearError) {
    const Home home;
    const std::size_t rest = 107 - (home / "run/").size();
    Program program = runZpd(home, {"-S", std::string(rest + 1, 's'), "-d", home / "annotations"});
    EXPECT_EQ(program.exitStatus(), 1);
    EXPECT_NE(program.errors().find(home / "run/"), std::string::npos) << program.errors();
    EXPECT_NE(program.errors().find("too long"), std::string::npos) << program.errors();

    const Daemon daemon(home.path(), {.service = std::string(rest, 's')});
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "");
    EXPECT_EQ(runZpd(home, {"-S", "a/b"}).exitStatus(), 1) << "outside the folder of sockets";
}

TEST(Start, AStoreThatCannotBeWrittenIsSaidOnce) {
    const Home home;
    Daemon daemon(home.path(), {.arguments = {"-d", home / "missing/annotations"}});
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({})), "");
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_EQ(daemon.linesWith(home / "missing"), 1u) << daemon.wholeLog();
}

} // namespace
} // namespace e2e
