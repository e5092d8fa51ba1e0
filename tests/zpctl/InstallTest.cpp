// "install" and "uninstall" on real folders.

#include <atomic>
#include <csignal>
#include <fcntl.h>
#include <functional>
#include <random>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "platform/file/File.h"
#include "tests/zpctl/ToolFixture.h"

namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::HasSubstr;

namespace {

constexpr const char* lock = ".zpctl.lock";
constexpr int plugIns = 6; // of what is installed

class Installing : public ToolFixture {
protected:
    Installing() { ::umask(022); }

    [[nodiscard]] std::string installed(const std::string& below = "") const {
        return home_ / ("Applications" + below);
    }

    // All names in the application folder, the hidden ones too.
    [[nodiscard]] std::vector<std::string> names() const {
        std::vector<std::string> found;
        for (const auto& entry : fs::directory_iterator(installed()))
            found.push_back(entry.path().filename());
        std::ranges::sort(found);
        return found;
    }

    void info(const std::string& folder, const std::string& identifier,
              const std::string& version = "1") const {
        home_.write(folder + "/Info.plist", "<plist><dict><key>BQBundleIdentifier</key><string>" +
                                                identifier +
                                                "</string><key>BQBundleVersion</key><string>" +
                                                version + "</string></dict></plist>");
    }

    // A source of some files, all of which hold the version.
    std::string source(const std::string& version, int files = plugIns) const {
        const std::string folder = "v" + version + "/A.app";
        info(folder, "com.example.a", version);
        for (int i = 0; i < files; ++i)
            home_.write(folder + "/PlugIns/P" + std::to_string(i) + ".appex/file", version);
        home_.write(folder + "/last", version);
        return home_ / folder;
    }

    // The version of what is installed; "half" unless it is whole.
    [[nodiscard]] std::string version() const {
        const auto content = [](const std::string& file) {
            const auto read = platform::readRegularFile(file, 100);
            return read ? read->bytes : std::string();
        };
        const std::string version = content(installed("/A.app/last"));
        for (int i = 0; i < plugIns; ++i) {
            const std::string file = "/A.app/PlugIns/P" + std::to_string(i) + ".appex/file";
            if (content(installed(file)) != version)
                return "half";
        }
        return version;
    }
};

// What a process of its own answers with, as its exit status.
int inChild(const std::function<int()>& act) {
    const pid_t child = ::fork();
    if (child == 0)
        ::_exit(act());
    int status = 0;
    ::waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

mode_t modeOf(const std::string& path) {
    struct ::stat status = {};
    return ::lstat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

TEST_F(Installing, CopiesWhatTheDaemonCanTrust) {
    const std::string app = source("1", 1);
    fs::create_symlink("/nowhere/at all", app + "/link");
    home_.write("v1/A.app/a\nline\x1b[31m", "odd");
    ASSERT_EQ(::chmod((app + "/last").c_str(), 06775), 0);
    ASSERT_EQ(::chmod((app + "/Info.plist").c_str(), 0660), 0);
    ASSERT_EQ(::chmod((app + "/PlugIns").c_str(), 01777), 0);

    EXPECT_EQ(statusOf({"uninstall", "com.example.a"}), Status::refused);
    EXPECT_FALSE(fs::exists(installed()));
    auto [status, out, err] = run({"--json", "install", app});
    ASSERT_EQ(status, Status::done) << err;
    const auto answer = nlohmann::json::parse(out);
    EXPECT_EQ(answer["path"], installed("/A.app"));
    EXPECT_EQ(answer["replaced"], nullptr);
    EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
    EXPECT_EQ(modeOf(installed("/A.app/last")), 0755U);
    EXPECT_EQ(modeOf(installed("/A.app/Info.plist")), 0640U);
    EXPECT_EQ(modeOf(installed("/A.app/PlugIns")), 0755U);
    EXPECT_EQ(modeOf(installed(std::string("/") + lock)), 0600U) << "nobody else can hold it";
    EXPECT_EQ(fs::read_symlink(installed("/A.app/link")), "/nowhere/at all");
    EXPECT_TRUE(fs::exists(installed("/A.app/a\nline\x1b[31m")));

    EXPECT_EQ(statusOf({"install", source("2")}), Status::done);
    EXPECT_EQ(version(), "2");
    EXPECT_FALSE(fs::exists(installed("/A.app/link"))) << "a new one, not the old with more in it";
    EXPECT_EQ(statusOf({"uninstall", "com.example.a"}), Status::done);
    EXPECT_THAT(names(), ElementsAre(lock));
    EXPECT_EQ(statusOf({"uninstall", "com.example.a"}), Status::refused);
}

TEST_F(Installing, RefusesWhatIsNoSoundApplication) {
    ASSERT_EQ(statusOf({"install", source("1")}), Status::done);
    const std::string sound = source("2");
    int copies = 0;
    using Spoil = std::function<void(const std::string& folder)>;
    const auto copyWith = [&](const char* name, const Spoil& spoil) {
        const std::string folder = "copy" + std::to_string(++copies) + "/" + name;
        fs::create_directories(fs::path(home_ / folder).parent_path());
        fs::copy(sound, home_ / folder, fs::copy_options::recursive);
        spoil(folder);
        return home_ / folder;
    };
    const auto expectRefused = [](const std::string& path, const char* why) {
        const Run refused = run({"install", path});
        EXPECT_EQ(refused.status, Status::refused) << path;
        EXPECT_THAT(refused.err, HasSubstr(why)) << path;
    };
    const Spoil asIs = [](const std::string&) {};
    const auto named = [&](const char* identifier) -> Spoil {
        return [this, identifier](const std::string& folder) { info(folder, identifier); };
    };
    const auto with = [&](const char* file, const char* content) -> Spoil {
        return [=, this](const std::string& folder) { home_.write(folder + file, content); };
    };
    const std::tuple<const char*, Spoil, const char*> cases[] = {
        {"A.bundle", asIs, "does not end in .app"},
        {".app", asIs, "does not end in .app"},
        {"N.app", [&](auto& folder) { fs::remove(home_ / (folder + "/Info.plist")); },
         "no Info.plist can be read"},
        {"D.app", with("/Info.plist", "<plist><array/></plist>"), "not a dictionary"},
        {"I.app", named(""), "BQBundleIdentifier"},
        {"J.app", named("../up"), "BQBundleIdentifier"},
        {"B.app", asIs, "is there already as A.app"},
        {"A.app", named("com.example.other"), "is another application there"},
        {"A.app", with("/.installing", ""), ".installing"},
    };
    for (const auto& [name, spoil, why] : cases)
        expectRefused(copyWith(name, spoil), why);
    expectRefused(home_ / "nothing.app", "No such file");
    expectRefused(installed("/A.app"), "where it belongs already");
    const std::string pipe = copyWith("A.app", [&](const std::string& folder) {
        ASSERT_EQ(::mkfifo((home_ / (folder + "/PlugIns/pipe\n")).c_str(), 0600), 0);
    });
    EXPECT_EQ(run({"install", pipe}).err,
              "zpctl: " + pipe + "/PlugIns/pipe\\u{a}: neither a file nor a folder nor a link\n");
    EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
    EXPECT_EQ(version(), "1");
    ASSERT_EQ(::chmod(installed().c_str(), 0777), 0);
    EXPECT_THAT(run({"install", source("2")}).err, HasSubstr("can be written by others"));
}

TEST_F(Installing, IsOneStepForWhoLooksAllTheTime) {
    ASSERT_EQ(statusOf({"install", source("1")}), Status::done);
    source("2");
    std::atomic<bool> done = false;
    int looks = 0;
    std::thread observer([&] {
        for (; !done; ++looks) {
            const platform::UniqueFd app(::open(installed("/A.app").c_str(), O_PATH | O_DIRECTORY));
            ASSERT_TRUE(app) << "absent";
            const std::string seen = version();
            struct ::stat before = {};
            struct ::stat after = {};
            ::fstat(app.get(), &before);
            ASSERT_EQ(::stat(installed("/A.app").c_str(), &after), 0) << "absent";
            const bool sameAllTheTime = before.st_ino == after.st_ino;
            ASSERT_TRUE(seen != "half" || !sameAllTheTime);
        }
    });
    std::vector<std::thread> installers;
    for (const char* version : {"1", "2"}) {
        installers.emplace_back([&, version] {
            for (int i = 0; i < 10; ++i)
                EXPECT_EQ(run({"install", home_ / ("v" + std::string(version) + "/A.app")}).status,
                          Status::done);
        });
    }
    for (std::thread& installer : installers)
        installer.join();
    done = true;
    observer.join();
    EXPECT_GT(looks, 20);
    EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
}

TEST_F(Installing, LeavesTheOldOrTheNewWhenKilled) {
    std::mt19937 random(4); // NOLINT: the same points each time
    const std::string sources[] = {source("1"), source("2")};
    ASSERT_EQ(statusOf({"install", sources[0]}), Status::done);
    const auto begin = std::chrono::steady_clock::now();
    ASSERT_EQ(statusOf({"install", sources[0]}), Status::done);
    const auto usual = std::chrono::steady_clock::now() - begin;
    int killed = 0;
    for (int i = 0; i < 30; ++i) {
        const std::string before = version();
        const std::string& next = sources[before == "1" ? 1 : 0];
        const pid_t child = ::fork();
        if (child == 0)
            ::_exit(static_cast<int>(run({"install", next}).status));
        std::this_thread::sleep_for(usual * (random() % 128) / 100);
        ::kill(child, SIGKILL);
        int status = 0;
        ::waitpid(child, &status, 0);
        killed += WIFSIGNALED(status) ? 1 : 0;
        EXPECT_THAT(version(), testing::AnyOf("1", "2")) << "was " << before;
        ASSERT_EQ(statusOf({"install", next}), Status::done);
        EXPECT_EQ(version(), next == sources[0] ? "1" : "2");
        EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
    }
    EXPECT_GT(killed, 0);
}

TEST_F(Installing, ClearsWhatEarlierRunsHaveLeftAndNothingElse) {
    const std::string kept = home_.write("kept/file", "kept");
    for (const char* left : {"/.zpctl.new/PlugIns", "/.zpctl.old/deep/er"}) {
        fs::create_directories(installed(left));
        fs::create_directory_symlink(home_ / "kept", installed(left) + "/link");
        ASSERT_EQ(::chmod(installed(left).c_str(), 0), 0);
    }
    home_.write("Applications/.other/file", "");
    ASSERT_EQ(statusOf({"install", source("1")}), Status::done);
    EXPECT_THAT(names(), ElementsAre(".other", lock, "A.app"));
    EXPECT_TRUE(fs::exists(kept));
}

TEST_F(Installing, LeavesNothingBehindWhenTheDiskIsFull) {
    ASSERT_EQ(statusOf({"install", source("1")}), Status::done);
    home_.write("v2/A.app/last", std::string(5000, 'x'));
    info("v2/A.app", "com.example.a");
    const int refused = inChild([&] {
        ::signal(SIGXFSZ, SIG_IGN);
        const ::rlimit small = {4096, 4096};
        ::setrlimit(RLIMIT_FSIZE, &small);
        return static_cast<int>(run({"install", home_ / "v2/A.app"}).status);
    });
    EXPECT_EQ(refused, static_cast<int>(Status::refused));
    EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
    EXPECT_EQ(version(), "1");
}

// An overlay cannot rename folders of its lower layer.
TEST_F(Installing, RefusesWhereFoldersCannotBeExchanged) {
    constexpr int cannotMount = 77;
    info("lower/A.app", "com.example.a", "0");
    for (const char* folder : {"upper", "work", "Applications"})
        fs::create_directories(home_ / folder);
    source("1");
    const int result = inChild([&] {
        const std::string layers = "redirect_dir=off,lowerdir=" + (home_ / "lower") +
                                   ",upperdir=" + (home_ / "upper") +
                                   ",workdir=" + (home_ / "work");
        if (::unshare(CLONE_NEWNS) != 0 ||
            ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            ::mount("none", installed().c_str(), "overlay", 0, layers.c_str()) != 0)
            return cannotMount;
        const Run refused = run({"install", home_ / "v1/A.app"});
        EXPECT_THAT(refused.err, HasSubstr("cannot exchange two folders in one step"));
        EXPECT_THAT(names(), ElementsAre(lock, "A.app"));
        EXPECT_TRUE(fs::exists(installed("/A.app/Info.plist")));
        return HasFailure() ? 1 : 0;
    });
    if (result == cannotMount)
        GTEST_SKIP() << "cannot mount an overlay here";
    EXPECT_EQ(result, 0);
}

} // namespace
