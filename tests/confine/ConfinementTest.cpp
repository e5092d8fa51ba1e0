// A real process under a real confinement, tried from inside, by root's plug-in with a user id of
// its own and by an ordinary user's.

#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <grp.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <gtest/gtest.h>

#include "platform/confine/PreparedConfinement.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/ConfinementScene.h"
#include "tests/support/Files.h"

using namespace platform;

namespace {

constexpr uid_t plugInUser = 1879048192 + 4711;
constexpr uid_t ordinaryUser = 12345;

void become(std::optional<uid_t> user) {
    if (user && (::setgroups(0, nullptr) != 0 || ::setresgid(*user, *user, *user) != 0 ||
                 ::setresuid(*user, *user, *user) != 0))
        ::_exit(90);
}

struct Running {
    pid_t pid;
    std::unique_ptr<ProbeTalk> talk;
};

// The probe, as the launcher would make it. Without a confinement for the control.
Running start(const std::string& bundle, std::optional<uid_t> user,
              const PreparedConfinement* confinement) {
    const int executable = ::open((bundle + "/probe").c_str(), O_RDONLY | O_CLOEXEC);
    int ends[2];
    if (executable < 0 || ::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0)
        return {-1, nullptr};
    const pid_t pid = ::fork();
    if (pid != 0) {
        ::close(executable);
        ::close(ends[1]);
        return {pid, std::make_unique<ProbeTalk>(ends[0])};
    }
    ::setpgid(0, 0);
    const int null = ::open("/dev/null", O_RDWR);
    ::dup2(null, 0);
    ::dup2(ends[1], 3);
    ::fcntl(executable, F_DUPFD_CLOEXEC, 0);
    become(user);
    if (confinement && confinement->enforce() != 0)
        ::_exit(91);
    const char* const arguments[] = {"probe", nullptr};
    const char* const environment[] = {"ZEPHRIN_SOCKET=3", nullptr};
    ::syscall(SYS_execveat, executable, "", arguments, environment, AT_EMPTY_PATH);
    ::_exit(92);
}

struct Tried {
    std::vector<Attempt> attempts;
    bool network = false;
    bool confined = false;
    std::optional<Control> control; // only those that this one must be able to do
};

void tryAll(Running running, const Tried& what) {
    ASSERT_TRUE(running.talk);
    for (const Attempt& attempt : what.attempts) {
        if (what.control && attempt.control != *what.control)
            continue;
        const auto wrong =
            objection(attempt, running.talk->outcome(attempt.line), what.confined, what.network);
        EXPECT_FALSE(wrong) << *wrong;
    }
    running.talk.reset();
    int status = 0;
    ::waitpid(running.pid, &status, 0);
    EXPECT_EQ(status, 0);
}

struct Stage {
    const TestFolder& folder;
    std::optional<uid_t> user; // of the plug-in
    bool hasSuid = false;
};

void makePlaces(const Stage& stage, const std::string& probe) {
    setMode(stage.folder.path(), 0755);
    stage.folder.write("bundle/probe", probe);
    setMode(stage.folder / "bundle/probe", 0755);
    std::filesystem::create_directories(stage.folder / "container");
    if (stage.user)
        giveAway(stage.folder / "container", *stage.user);
}

void tryEverything(const Stage& stage) {
    if (KernelFeatures::ofThisSystem().landlock == 0)
        GTEST_SKIP() << "without Landlock files are not guarded";
    const std::string bundle = stage.folder / "bundle";
    const std::string container = stage.folder / "container";
    const ConfinementScene scene({.folder = stage.folder.path(),
                                  .bundle = bundle,
                                  .container = container,
                                  .otherContainer = stage.folder / "other",
                                  .library = "",
                                  .sockets = {},
                                  .files = {},
                                  .hasSuid = stage.hasSuid});
    for (const Control control : {Control::daemon, Control::plugIn}) {
        SCOPED_TRACE(control == Control::daemon ? "as the daemon's user, not confined"
                                                : "as the plug-in's user, not confined");
        const auto user = control == Control::plugIn ? stage.user : std::nullopt;
        tryAll(start(bundle, user, nullptr), {.attempts = scene.attempts(), .control = control});
        scene.tidy();
    }
    for (const char* profile : {"plugin", "keyboard"}) {
        for (const int landlock : {1, 2, 3, 4, 5, 7}) {
            SCOPED_TRACE(std::string(profile) + " with Landlock " + std::to_string(landlock));
            KernelFeatures features = KernelFeatures::ofThisSystem();
            features.landlock = std::min(features.landlock, landlock);
            const auto confinement =
                PreparedConfinement::prepare({profile, bundle, container, stage.user}, features);
            ASSERT_TRUE(confinement) << describe(confinement.error());
            tryAll(start(bundle, stage.user, &*confinement),
                   {.attempts = scene.attempts(),
                    .network = std::string_view(profile) == "plugin",
                    .confined = true});
            scene.tidy();
        }
    }
}

std::string probeProgram() {
    return contentOf(ZEPHRIN_TEST_PROGRAMS "/confine_probe");
}

// A test within the test, as another user.
void as(std::optional<uid_t> user, const std::function<void()>& test) {
    const pid_t child = ::fork();
    if (child == 0) {
        become(user);
        test();
        std::fflush(nullptr);
        ::_exit(testing::Test::HasFailure() ? 1 : 0);
    }
    int status = 0;
    ::waitpid(child, &status, 0);
    EXPECT_EQ(status, 0);
}

bool mayHaveSuid(const std::string& folder) {
    struct ::statvfs status{};
    return ::statvfs(folder.c_str(), &status) == 0 && (status.f_flag & ST_NOSUID) == 0;
}

} // namespace

TEST(Confinement, HoldsForAPlugInWithAUserOfItsOwn) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "only root gives user ids";
    const TestFolder folder;
    const Stage stage{folder, plugInUser, mayHaveSuid(folder.path())};
    makePlaces(stage, probeProgram());
    folder.write("bundle/suid", probeProgram());
    setMode(folder / "bundle/suid", 04755);
    tryEverything(stage);
}

TEST(Confinement, HoldsForAPlugInOfAnOrdinaryUser) {
    const bool root = ::geteuid() == 0;
    const std::string probe = probeProgram();
    const TestFolder folder;
    Stage stage{folder, std::nullopt, root && mayHaveSuid(folder.path())};
    if (root) {
        folder.write("bundle/suid", probe);
        setMode(folder / "bundle/suid", 04755);
        giveAway(folder / "bundle", ordinaryUser);
        giveAway(folder.path(), ordinaryUser);
    }
    as(root ? std::optional(ordinaryUser) : std::nullopt, [&] {
        makePlaces(stage, probe);
        tryEverything(stage);
    });
}

// The daemon never asks for it; should it, root without its powers is a user like others.
TEST(Confinement, HoldsForAPlugInOfRoots) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "only root can run it";
    const TestFolder folder;
    const Stage stage{folder, std::nullopt};
    makePlaces(stage, probeProgram());
    tryEverything(stage);
}
