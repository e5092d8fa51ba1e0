// A plug-in that was made ready, started in its sandbox and is talked to, and that tries what it
// must not: by root's daemon with a user id of its own, and by an ordinary user's daemon.

#include <cstdio>
#include <functional>
#include <grp.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "tests/e2e/Signing.h"
#include "tests/support/ConfinementScene.h"

namespace e2e {
namespace {

constexpr uid_t ordinaryUser = 4711;
constexpr uid_t firstPlugInUser = 1879048192;

struct Ends {
    int ours;
    int theirs;
};

Ends makeSocket() {
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0)
        throw std::runtime_error("socketpair");
    return {ends[0], ends[1]};
}

// The programs that take part, where every user can run them.
class Confined : public DaemonTest {
protected:
    Confined() {
        for (const char* name : {"zpd", "zpd-launcher", "zpctl"})
            (void)addProgram(home / (std::string("bin/") + name), name);
        (void)addProgram(library_, "../lib/libZephrin.so.0");
        addProbe("Typing", "com.tovana.keyboard-service");
        addProbe("Widget", "com.tovana.widget");
    }

    [[nodiscard]] std::string bundleOf(const std::string& name) const {
        return home / ("Applications/" + name + ".app/PlugIns/" + name + ".appex");
    }

    [[nodiscard]] std::string containerOf(const std::string& name) const {
        return home / ("lib/Containers/" + name);
    }

    // To be talked to through a socket.
    [[nodiscard]] Program talkingTo(int socket, const std::vector<std::string>& command) const {
        return Program({.command = command,
                        .settings = {{"ZEPHRIN_HOME", home.path()}, {"ZEPHRIN_SOCKET", "0"}},
                        .errorFile = home / "errors",
                        .inputFd = socket,
                        .outputFd = socket});
    }

    void tryAll(const std::string& name, const std::string& other, bool network) {
        const ConfinementScene scene(
            {.folder = home / ("scene-" + name),
             .bundle = bundleOf(name),
             .container = containerOf(name),
             .otherContainer = containerOf(other),
             .library = library_,
             .sockets = {daemon->socketPath(), home / "run/com.tovana.jobd",
                         home / "run/com.tovana.sandbox"},
             .files = {home / "annotations", home / "lib/AppRegistry.db"},
             .hasSuid = hasSuid});
        std::vector<Attempt> control;
        for (const Attempt& each : scene.attempts()) {
            if (each.control == Control::daemon)
                control.push_back(each);
        }
        tryOne({bundleOf(name) + "/probe"}, control, false, true);
        scene.tidy();
        const std::string uuid = findAt(*client, bundleOf(name))["uuid"].text();
        tryOne(tool({"run", uuid}), scene.attempts(), true, network);
    }

    void tryEverything() {
        constexpr unsigned askVersion = 1;
        if (syscall(SYS_landlock_create_ruleset, nullptr, 0, askVersion) <= 0)
            GTEST_SKIP() << "without Landlock files are not guarded";
        start({.program = home / "bin/zpd"});
        EXPECT_EQ(matched(*client, Item::map({}), 1), "Typing Widget");
        const std::string uuid = findAt(*client, bundleOf("Typing"))["uuid"].text();
        Program elect({.command = tool({"elect", uuid, "on"}),
                       .settings = {{"ZEPHRIN_HOME", home.path()}},
                       .errorFile = home / "errors"});
        EXPECT_EQ(elect.exitStatus(), 0) << elect.errors();
        ASSERT_TRUE(eventually([&] { return fs::exists(home / "annotations"); }));
        tryAll("Typing", "Widget", false);
        tryAll("Widget", "Typing", true);
    }

    bool hasSuid = false;

private:
    const std::string library_ = home / "lib/libZephrin.so.0"; // beside what no plug-in may read

    void addProbe(const std::string& name, const std::string& point) const {
        const PlugIn plugIn{.identifier = name,
                            .point = point,
                            .info = Item::map({{"BQBundleExecutable", "probe"}})};
        const std::string path = addAppWith(home, name, plugIn);
        (void)addProgram(path + "/probe", "confine_probe");
        fs::create_directories(home / ("scene-" + name));
    }

    [[nodiscard]] std::vector<std::string> tool(std::vector<std::string> words) const {
        words.insert(words.begin(), {home / "bin/zpctl", "--service", "e2e"});
        return words;
    }

    void tryOne(const std::vector<std::string>& command, const std::vector<Attempt>& attempts,
                bool confined, bool network) const {
        SCOPED_TRACE(command.back() + (confined ? ", confined" : ", not confined"));
        const Ends ends = makeSocket();
        Program program = talkingTo(ends.theirs, command);
        close(ends.theirs);
        {
            const ProbeTalk talk(ends.ours);
            for (const Attempt& each : attempts) {
                const auto wrong = objection(each, talk.outcome(each.line), confined, network);
                EXPECT_FALSE(wrong) << *wrong;
            }
        }
        EXPECT_EQ(program.exitStatus(), 0) << program.errors();
    }
};

// A set-user-id program for it to gain by, where the file system knows such.
void addSuid(const std::string& bundle) {
    (void)addProgram(bundle + "/suid", "confine_probe");
    ASSERT_EQ(chmod((bundle + "/suid").c_str(), 04755), 0);
}

bool knowsSuid(const std::string& folder) {
    struct ::statvfs status{};
    return statvfs(folder.c_str(), &status) == 0 && (status.f_flag & ST_NOSUID) == 0;
}

void giveAllTo(uid_t user, const std::string& folder) {
    for (const auto& entry : fs::recursive_directory_iterator(folder))
        ASSERT_EQ(lchown(entry.path().c_str(), user, user), 0);
    ASSERT_EQ(chown(folder.c_str(), user, user), 0);
}

// A test within the test; false when it fails.
bool passesAs(uid_t user, const std::function<void()>& test) {
    const pid_t child = fork();
    if (child == 0) {
        if (setgroups(0, nullptr) == 0 && setresgid(user, user, user) == 0 &&
            setresuid(user, user, user) == 0)
            test();
        else
            ADD_FAILURE() << "cannot become another user";
        std::fflush(nullptr);
        _exit(testing::Test::HasFailure() ? 1 : 0);
    }
    int status = -1;
    waitpid(child, &status, 0);
    return status == 0;
}

TEST_F(Confined, ByRootsDaemonAsAUserOfItsOwn) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root gives user ids";
    hasSuid = knowsSuid(home.path());
    addSuid(bundleOf("Typing"));
    addSuid(bundleOf("Widget"));
    tryEverything();
    struct ::stat status{};
    ASSERT_EQ(stat(containerOf("Widget").c_str(), &status), 0);
    EXPECT_THAT(status.st_uid,
                testing::AllOf(testing::Ge(firstPlugInUser), testing::Lt(firstPlugInUser + 2)));
}

TEST_F(Confined, ByAnOrdinaryUsersDaemon) {
    if (geteuid() != 0)
        return tryEverything();
    giveAllTo(ordinaryUser, home.path());
    EXPECT_TRUE(passesAs(ordinaryUser, [this] { tryEverything(); }));
}

} // namespace
} // namespace e2e
