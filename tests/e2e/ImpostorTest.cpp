// Programs that would pass for the one that connected: by becoming a signed program, by keeping its
// socket, by its pid.

#include <memory>
#include <unistd.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr int tries = 200;

class Impostors : public ManagerTest {
protected:
    Impostors() {
        fs::copy_file("/bin/sleep", sleeper);
        key.sign(sleeper);
        start();
    }

    // Each says `expected`, line by line.
    void paced(const Words& probes, const Words& expected) const {
        for (int i = 0; i < tries && !HasFailure(); ++i)
            EXPECT_EQ(Talk(home, probes).rest(), expected);
    }

    // All at once. They run before the daemon looks at any of them when it is `stopped` meanwhile.
    void burst(const Words& probes, const Words& expected, bool stopped) {
        std::vector<std::unique_ptr<Talk>> all;
        if (stopped)
            daemon->program().signal(SIGSTOP);
        for (int i = 0; i < tries; ++i)
            all.push_back(std::make_unique<Talk>(home, probes));
        if (stopped) {
            std::this_thread::sleep_for(500ms);
            daemon->program().signal(SIGCONT);
        }
        for (const auto& each : all)
            EXPECT_EQ(each->rest(), expected);
    }

    const std::string& probe = manager;
    const std::string unsignedProbe = addProgram(home / "tools/unsigned");
    const std::string sleeper = home / "tools/sleeper";
};

TEST_F(Impostors, BecomeASignedProgramAfterConnecting) {
    const Words both = {refused, refused};
    const Words whole = command(unsignedProbe, {"exec-aside " + sleeper + " 60"});
    const Words half = command(unsignedProbe, {"exec-aside-half " + sleeper + " 60"});
    paced(whole, both);
    burst(half, both, false);
    const std::size_t before = daemon->linesWith(" " + sleeper);
    burst(whole, both, true);
    burst(half, both, true);
    EXPECT_GT(daemon->linesWith(" " + sleeper), before) << "taken for what they became";
}

TEST_F(Impostors, KeepTheSocketOfASignedProgram) {
    Words steps = {"hello", "ask"};
    Words answers = {granted};
    for (int i = 0; i < tries; ++i) {
        steps.emplace_back("child-asks");
        answers.push_back(refused);
    }
    steps.emplace_back("ask");
    answers.push_back(granted);
    EXPECT_EQ(Talk(home, command(probe, steps)).rest(), answers);

    const Words heir = command(probe, {"hello", "ask", "heir-asks"});
    paced(heir, {granted, refused});
    burst(heir, {granted, refused}, false);
}

TEST_F(Impostors, TakeTheSocketOverByExec) {
    const std::string next = "exec " + unsignedProbe + " " + daemon->socketPath() + " take:FD ask";
    paced(command(probe, {"hello", "ask", next}), {granted, refused});
}

TEST_F(Impostors, HaveThePidOfTheSignedProgramThatLeftThemItsSocket) {
    Talk talk(home, command(probe, {"hello", "ask", "namesake-asks"}));
    ASSERT_EQ(talk.hear(), granted);
    EXPECT_EQ(talk.program().exitStatus(), 0);
    const std::string answer = talk.hear();
    if (answer.starts_with("no pid of choice"))
        GTEST_SKIP() << answer;
    EXPECT_EQ(answer, refused);
}

TEST_F(Impostors, ForgeThePidOfASignedProgramFromNamespacesOfTheirOwn) {
    const Words attack = command(unsignedProbe, {"forge " + sleeper});
    const auto user = geteuid() == 0 ? std::optional<uid_t>(4711) : std::nullopt;
    Talk talk(home, attack, user);
    daemon->program().signal(SIGSTOP);
    std::this_thread::sleep_for(200ms);
    daemon->program().signal(SIGCONT);
    const std::string answer = talk.hear();
    if (answer.starts_with("namespaces"))
        GTEST_SKIP() << answer;
    EXPECT_EQ(answer, refused);
}

TEST_F(Impostors, StallNobodyWithHugeFiles) {
    constexpr std::uintmax_t terabyte = std::uintmax_t{1} << 40;
    const std::string huge = addProgram(home / "tools/huge");
    key.sign(huge);
    fs::resize_file(huge, terabyte);
    const auto start = std::chrono::steady_clock::now();
    Talk talk(home, command(huge, {"hello", "ask"}));
    for (int i = 0; i < 20; ++i)
        EXPECT_EQ(answerTo(probe), granted);
    EXPECT_EQ(talk.hear(), refused);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 10s);
}

} // namespace
} // namespace e2e
