// Signed programs of whom the daemon knows too little, or that are more confined than it is.

#include <filesystem>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr uid_t daemonUser = 4711;
constexpr uid_t otherUser = 4712;

void giveTo(uid_t user, const std::string& folder) {
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder))
        ASSERT_EQ(lchown(entry.path().c_str(), user, user), 0);
    ASSERT_EQ(chown(folder.c_str(), user, user), 0);
}

TEST(Strangers, OfAnOrdinaryUsersDaemonHaveNoEntitlements) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can run programs as other users";
    const Home home;
    const Signer key(home);
    const std::string readable = addProgram(home / "tools/probe");
    const std::string secret = addProgram(home / "tools/secret");
    key.sign(readable);
    key.sign(secret);
    const std::string zpd = addProgram(home / "bin/zpd", "zpd");
    giveTo(daemonUser, home.path());
    ASSERT_EQ(chown(secret.c_str(), 0, 0), 0);
    ASSERT_EQ(chmod(secret.c_str(), 0711), 0);
    const Daemon daemon(home.path(), {.program = zpd, .user = daemonUser});
    EXPECT_TRUE(daemon.logs("not running as root: only this user's programs can be recognized"));

    const struct {
        const char* what;
        std::vector<std::string> command;
        uid_t user;
        std::string answer;
        bool known; // its path
    } cases[] = {
        {"of the same user",
         {readable, daemon.socketPath(), "hello", "ask"},
         daemonUser,
         granted,
         true},
        {"of another user",
         {readable, daemon.socketPath(), "hello", "ask"},
         otherUser,
         refused,
         false},
        {"of root", {readable, daemon.socketPath(), "hello", "ask"}, 0, refused, false},
        {"that may be executed, not read",
         {secret, daemon.socketPath(), "hello", "ask"},
         daemonUser,
         refused,
         false},
        {"that hides",
         {readable, daemon.socketPath(), "hide", "hello", "ask"},
         daemonUser,
         refused,
         false},
    };

    for (const auto& each : cases) {
        SCOPED_TRACE(each.what);
        Talk talk(home, each.command, each.user);
        EXPECT_EQ(talk.hear(), each.answer);
        const std::string line = "new client " + std::to_string(talk.program().pid()) + " ";
        EXPECT_TRUE(daemon.logs(line));
        EXPECT_EQ(daemon.linesWith(line + "/") > 0, each.known);
    }
}

TEST(Strangers, AreThoseInAMountNamespaceOfTheirOwn) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can make a mount namespace alone";
    const Home home;
    const Signer key(home);
    const std::string probe = addProgram(home / "tools/probe");
    key.sign(probe);
    const Daemon daemon(home.path());
    EXPECT_EQ(Talk(home, {probe, daemon.socketPath(), "confine", "hello", "ask"}).hear(), refused);
    EXPECT_EQ(Talk(home, {probe, daemon.socketPath(), "hello", "ask"}).hear(), granted);
}

} // namespace
} // namespace e2e
