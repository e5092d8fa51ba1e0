// Signed programs of whom the daemon knows too little, or that are more confined than it is.

#include <unistd.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr uid_t daemonUser = 4711;
constexpr uid_t otherUser = 4712;

void giveTo(uid_t user, const std::string& folder) {
    for (const auto& entry : fs::recursive_directory_iterator(folder))
        ASSERT_EQ(lchown(entry.path().c_str(), user, user), 0);
    ASSERT_EQ(chown(folder.c_str(), user, user), 0);
}

using Strangers = ManagerTest;

TEST_F(Strangers, OfAnOrdinaryUsersDaemonHaveNoEntitlements) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can run programs as other users";
    const std::string secret = addProgram(home / "tools/secret");
    key.sign(secret);
    const std::string zpd = addProgram(home / "bin/zpd", "zpd");
    giveTo(daemonUser, home.path());
    ASSERT_EQ(chown(secret.c_str(), 0, 0), 0);
    ASSERT_EQ(chmod(secret.c_str(), 0711), 0);
    start({.program = zpd, .user = daemonUser});
    EXPECT_TRUE(daemon->logs("not running as root: only this user's programs can be recognized"));

    const struct {
        const char* what;
        Words command;
        uid_t user;
        std::string answer = refused;
        bool known = false; // its path
    } cases[] = {
        {"of the same user", command(manager, {"hello", "ask"}), daemonUser, granted, true},
        {"of another user", command(manager, {"hello", "ask"}), otherUser},
        {"of root", command(manager, {"hello", "ask"}), 0},
        {"that may be executed, not read", command(secret, {"hello", "ask"}), daemonUser},
        {"that hides", command(manager, {"hide", "hello", "ask"}), daemonUser},
    };

    for (const auto& each : cases) {
        SCOPED_TRACE(each.what);
        Talk talk(home, each.command, each.user);
        EXPECT_EQ(talk.hear(), each.answer);
        const std::string line = "new client " + std::to_string(talk.program().pid()) + " ";
        EXPECT_TRUE(daemon->logs(line));
        EXPECT_EQ(daemon->linesWith(line + "/") > 0, each.known);
    }
}

TEST_F(Strangers, AreThoseInAMountNamespaceOfTheirOwn) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can make a mount namespace alone";
    start();
    EXPECT_EQ(answerTo(manager, {"confine", "hello", "ask"}), refused);
    EXPECT_EQ(answerTo(manager), granted);
}

} // namespace
} // namespace e2e
