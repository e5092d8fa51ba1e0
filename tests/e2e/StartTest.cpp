#include <algorithm>

#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

const char* const usage = "Usage: zpd [-S servicename] [-v]\n";

class Start : public DaemonTest {
protected:
    [[nodiscard]] Program runZpd(std::vector<std::string> arguments) const {
        arguments.insert(arguments.begin(), builtProgram("zpd"));
        fs::remove(home / "errors");
        return Program({.command = arguments,
                        .settings = {{"ZEPHRIN_HOME", home.path()}},
                        .errorFile = home / "errors"});
    }
};

TEST_F(Start, WrongOptionsPrintTheUsageAndNothingElse) {
    const std::vector<std::vector<std::string>> cases = {
        {"extra"}, {"-x"}, {"-S"}, {"-c"}, {"--help"}, {"-vx"}, {"--", "extra"}, {"-v", "x"}};
    for (const std::vector<std::string>& arguments : cases) {
        SCOPED_TRACE(arguments[0]);
        Program program = runZpd(arguments);
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

TEST_F(Start, SaysThatVerboseHasNoEffect) {
    start({.arguments = {"-v", "-vv"}});
    stop();
    expectLog({{"default error: verbose option -v is ineffective; use log config "
                "--subsystem com.tovana.zephrin",
                3},
               {"ops info: zpd is launching", 1}});
}

TEST_F(Start, TheLastCacheLimitIsKept) {
    home.addAppWithPlugIns("Some", {"a", "b", "c", "d"});
    start({.arguments = {"-c", "9", "-c", "2abc"}});
    // Each time the whole cache goes before the fourth record, and nothing before comes again.
    for (const std::size_t times : {1U, 2U}) {
        EXPECT_EQ(seen(), "a b c d");
        EXPECT_TRUE(eventually(
            [&] { return daemon->linesWith("default: createPlugInForProxy") == 4 * times; }));
        EXPECT_EQ(daemon->linesWith("ops info: purging cache for 3 > 2"), times);
    }
}

TEST_F(Start, TerminationIsOrderly) {
    start();
    for (int i = 0; i < 100; ++i)
        client->post(envelope("match"));
    stop();
    EXPECT_TRUE(client->ended());
    EXPECT_EQ(daemon->linesWith(" error: "), 0u);
}

TEST_F(Start, ASecondDaemonOnALiveNameFails) {
    addAppWith(home, "A", {.identifier = "a"});
    start();
    Program second = runZpd({"-S", "e2e", "-d", home / "annotations"});
    EXPECT_EQ(second.exitStatus(), 1);
    EXPECT_NE(second.errors().find("ops error: unable to construct server"), std::string::npos)
        << second.errors();
    // Under another name it lives beside the first one, which keeps its database to itself.
    const Daemon third(home.path(), {.service = "another"});
    EXPECT_TRUE(third.logs("another daemon uses "));
    WireClient other = third.connect();
    EXPECT_EQ(matched(other), "a");
    EXPECT_EQ(seen(), "a");
    client.emplace(daemon->connect());
    EXPECT_EQ(seen(), "a");
}

TEST_F(Start, AStaleSocketIsReplaced) {
    for (int i = 0; i < 2; ++i) {
        start();
        kill();
        EXPECT_TRUE(fs::is_socket(daemon->socketPath()));
    }
    start();
    EXPECT_EQ(seen(), "");
    EXPECT_EQ(fs::status(daemon->socketPath()).permissions(), fs::perms(0666));
    EXPECT_EQ(fs::status(home / "run").permissions(), fs::perms(0755));
}

TEST_F(Start, ASocketPathThatIsTooLongIsAClearError) {
    const std::size_t rest = 107 - (home / "run/").size();
    Program program = runZpd({"-S", std::string(rest + 1, 's'), "-d", home / "annotations"});
    EXPECT_EQ(program.exitStatus(), 1);
    EXPECT_NE(program.errors().find(home / "run/"), std::string::npos) << program.errors();
    EXPECT_NE(program.errors().find("too long"), std::string::npos) << program.errors();

    start({.service = std::string(rest, 's')});
    EXPECT_EQ(seen(), "");
    EXPECT_EQ(runZpd({"-S", "a/b"}).exitStatus(), 1) << "outside the folder of sockets";
}

TEST_F(Start, AStoreThatCannotBeWrittenIsSaidOnce) {
    start({.arguments = {"-d", home / "missing/annotations"}});
    EXPECT_EQ(seen(), "");
    stop();
    EXPECT_EQ(daemon->linesWith(home / "missing"), 1u) << daemon->wholeLog();
}

} // namespace
} // namespace e2e
