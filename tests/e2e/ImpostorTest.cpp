// Programs that would pass for the one that connected: by becoming a signed program, by keeping its
// socket, by its pid.

#include <filesystem>
#include <memory>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/e2e/Replies.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr int tries = 200;

class Impostors : public testing::Test {
protected:
    Impostors() {
        key.sign(probe);
        std::filesystem::copy_file("/bin/sleep", sleeper);
        key.sign(sleeper);
        daemon.emplace(home.path());
    }

    using Command = std::vector<std::string>;

    [[nodiscard]] Command command(const std::string& program, const Command& steps) const {
        Command result = {program, daemon->socketPath()};
        result.insert(result.end(), steps.begin(), steps.end());
        return result;
    }

    // Each says `expected`, line by line.
    void paced(const Command& command, const Command& expected) const {
        for (int i = 0; i < tries && !HasFailure(); ++i)
            EXPECT_EQ(Talk(home, command).rest(), expected);
    }

    // All at once. They run before the daemon looks at any of them when it is `stopped` meanwhile.
    void burst(const Command& command, const Command& expected, bool stopped) const {
        std::vector<std::unique_ptr<Talk>> all;
        if (stopped)
            kill(daemon->pid(), SIGSTOP);
        for (int i = 0; i < tries; ++i)
            all.push_back(std::make_unique<Talk>(home, command));
        if (stopped) {
            std::this_thread::sleep_for(500ms);
            kill(daemon->pid(), SIGCONT);
        }
        for (const auto& each : all)
            EXPECT_EQ(each->rest(), expected);
    }

    const Home home;
    const Signer key{home};
    const std::string probe = addProgram(home / "tools/probe");
    const std::string unsignedProbe = addProgram(home / "tools/unsigned");
    const std::string sleeper = home / "tools/sleeper";
    std::optional<Daemon> daemon;
};

TEST_F(Impostors, BecomeASignedProgramAfterConnecting) {
    const Command both = {refused, refused};
    const Command whole = command(unsignedProbe, {"exec-aside " + sleeper + " 60"});
    const Command half = command(unsignedProbe, {"exec-aside-half " + sleeper + " 60"});
    paced(whole, both);
    burst(half, both, false);
    const std::size_t before = daemon->linesWith(" " + sleeper);
    burst(whole, both, true);
    burst(half, both, true);
    EXPECT_GT(daemon->linesWith(" " + sleeper), before) << "taken for what they became";
}

TEST_F(Impostors, KeepTheSocketOfASignedProgram) {
    Command steps = {"hello", "ask"};
    Command answers = {granted};
    for (int i = 0; i < tries; ++i) {
        steps.emplace_back("child-asks");
        answers.push_back(refused);
    }
    steps.emplace_back("ask");
    answers.push_back(granted);
    EXPECT_EQ(Talk(home, command(probe, steps)).rest(), answers);

    const Command heir = command(probe, {"hello", "ask", "heir-asks"});
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
    const Command attack = command(unsignedProbe, {"forge " + sleeper});
    const auto user = geteuid() == 0 ? std::optional<uid_t>(4711) : std::nullopt;
    Talk talk(home, attack, user);
    kill(daemon->pid(), SIGSTOP);
    std::this_thread::sleep_for(200ms);
    kill(daemon->pid(), SIGCONT);
    const std::string answer = talk.hear();
    if (answer.starts_with("namespaces"))
        GTEST_SKIP() << answer;
    EXPECT_EQ(answer, refused);
}

TEST_F(Impostors, StallNobodyWithHugeFiles) {
    constexpr std::uintmax_t terabyte = std::uintmax_t{1} << 40;
    const std::string huge = addProgram(home / "tools/huge");
    key.sign(huge);
    std::filesystem::resize_file(huge, terabyte);
    const auto start = std::chrono::steady_clock::now();
    Talk talk(home, command(huge, {"hello", "ask"}));
    for (int i = 0; i < 20; ++i)
        EXPECT_EQ(Talk(home, command(probe, {"hello", "ask"})).hear(), granted);
    EXPECT_EQ(talk.hear(), refused);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 10s);
}

} // namespace
} // namespace e2e
