#include <algorithm>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <sched.h>
#include <sys/inotify.h>
#include <sys/mount.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/e2e/Annotations.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr int pipelined = 200;

// What is left beside the store.
std::size_t unfinishedFiles(const std::string& folder) {
    return static_cast<std::size_t>(
        std::ranges::count_if(fs::directory_iterator(folder), [](const auto& file) {
            return file.path().filename().native().starts_with(".");
        }));
}

Item numbered(int number) {
    return Item::map({{"extension", Item::map({{"number", number}})}});
}

std::string stored(int number) {
    return "<integer>" + std::to_string(number) + "</integer>";
}

// Counts how often a file of a folder was replaced.
class Replacements {
public:
    explicit Replacements(const std::string& folder) : fd_(inotify_init1(IN_NONBLOCK)) {
        inotify_add_watch(fd_, folder.c_str(), IN_MOVED_TO);
    }

    Replacements(const Replacements&) = delete;
    Replacements& operator=(const Replacements&) = delete;

    ~Replacements() { close(fd_); }

    // Since it was asked last.
    int count() const {
        int events = 0;
        // Just enough for one event, with the name of the store.
        alignas(inotify_event) char room[sizeof(inotify_event) + 16];
        while (read(fd_, room, sizeof room) > 0)
            ++events;
        return events;
    }

private:
    int fd_;
};

class AnnotationSaving : public AnnotationTest {
protected:
    // Requests of one client, all at once, each with another number for one of the plug-ins.
    class Flood {
    public:
        Flood(AnnotationSaving& test, int first) : client_(*test.client) {
            for (int i = 0; i < pipelined; ++i) {
                const std::string identifier(1, "abc"[i % 3]);
                const Item request = test.annotating(identifier, numbered(first + i));
                asked_[client_.post(request)] = {identifier, first + i};
            }
        }

        // False when no reply comes any more.
        bool hear() {
            const auto frame = client_.receive();
            if (!frame)
                return false;
            const auto& [identifier, number] = asked_.at(frame->id);
            acknowledged[identifier] = std::max(acknowledged[identifier], number);
            return true;
        }

        std::map<std::string, int> acknowledged; // the last number of each plug-in

    private:
        WireClient& client_;
        std::map<std::uint64_t, std::pair<std::string, int>> asked_;
    };

    [[nodiscard]] int current(const std::string& identifier) {
        return static_cast<int>(annotations().at(identifier)["extension"]["number"].number());
    }
};

TEST_F(AnnotationSaving, KeepsWhatWasAcknowledgedWhenTheDaemonIsKilled) {
    constexpr int rounds = 50;
    int number = 1;
    for (int round = 0; round < rounds; ++round, number += pipelined) {
        const int signal = round % 10 == 9 ? SIGTERM : SIGKILL;
        Flood flood(*this, number);
        for (int heard = 0; heard < round && flood.hear();)
            ++heard;
        std::this_thread::sleep_for(std::chrono::microseconds(round % 7 * 50));
        daemon->program().signal(signal);
        while (flood.hear()) {}
        EXPECT_EQ(daemon->program().exitStatus(), signal == SIGTERM ? 0 : 128 + SIGKILL);
        if (signal == SIGTERM) {
            EXPECT_EQ(unfinishedFiles(home.path()), 0U);
        }
        start();
        for (const auto& [identifier, acknowledged] : flood.acknowledged) {
            EXPECT_GE(current(identifier), acknowledged) << identifier;
            EXPECT_LT(current(identifier), number + pipelined) << identifier;
        }
        EXPECT_EQ(unfinishedFiles(home.path()), 0U);
    }
    EXPECT_EQ(daemon->linesWith("unable to load annotation database"), 0U);
}

TEST_F(AnnotationSaving, OneSaveServesAllWhoWait) {
    const Replacements saves(home.path());
    Flood flood(*this, 1);
    for (int i = 0; i < pipelined; ++i)
        ASSERT_TRUE(flood.hear());
    const int count = saves.count();
    EXPECT_GT(count, 0);
    EXPECT_LT(count, pipelined / 2);
    EXPECT_EQ(flood.acknowledged.at("b"), pipelined);

    (void)client->request(annotating("b", numbered(pipelined)));
    EXPECT_EQ(saves.count(), 0) << "nothing changed";
    Item every = annotating("a", numbered(5000));
    (void)client->request(every.set("uuids", Item::array({uuid("a"), uuid("b"), uuid("c")})));
    EXPECT_EQ(saves.count(), 1);
}

using AutoElection = DaemonTest;

TEST_F(AutoElection, IsSavedBeforeTheDiscoveryIsAnswered) {
    const Signer signer(home);
    const std::string app = home.addAppWithPlugIns("Some", {"a", "b", "c"});
    for (const auto& plugIn : fs::directory_iterator(app + "/PlugIns"))
        signer.sign(plugIn.path(), Item::map({{"com.tovana.developer.auto-elect-plugin", true}}));
    start();
    const Replacements saves(home.path());
    for (const int expected : {1, 0}) {
        EXPECT_EQ(seen(Item::map({{"HXUserElection", "1"}})), "a b c");
        EXPECT_EQ(saves.count(), expected);
        EXPECT_TRUE(readFile(home / "annotations").contains("<key>c</key>"));
    }
}

// A small file system that only this process and what it starts can see.
class SmallDisk {
public:
    explicit SmallDisk(std::string folder) : folder_(std::move(folder)) {
        fs::create_directory(folder_);
        if (unshare(CLONE_NEWNS) != 0 ||
            mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            mount("none", folder_.c_str(), "tmpfs", 0, "size=64k,mode=755") != 0)
            trouble = std::strerror(errno);
    }

    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;

    ~SmallDisk() { umount2(folder_.c_str(), MNT_DETACH); }

    bool fill() const {
        const int file = open(filler().c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
        while (write(file, "x", 1) == 1) {}
        const bool full = errno == ENOSPC;
        close(file);
        return full;
    }

    bool clear() const { return fs::remove(filler()); }

    // Waits until nobody has a file open for writing.
    bool makeReadOnly() const {
        return eventually([&] { return remount(MS_RDONLY); });
    }

    bool makeWritable() const { return remount(0); }

    std::string trouble; // why there is none

private:
    [[nodiscard]] std::string filler() const { return folder_ + "/filler"; }

    [[nodiscard]] bool remount(unsigned long flags) const {
        return mount(nullptr, folder_.c_str(), nullptr, MS_REMOUNT | flags, nullptr) == 0;
    }

    std::string folder_;
};

TEST_F(AnnotationSaving, OutlivesADiskThatIsFullOrReadOnly) {
    const SmallDisk disk(home / "disk");
    if (!disk.trouble.empty())
        GTEST_SKIP() << "cannot mount a file system here: " << disk.trouble;
    const std::string file = home / "disk/annotations";
    const Daemon::Options options{.arguments = {"-d", file}};

    const struct {
        const char* name;
        std::function<bool()> spoil;
        std::function<bool()> mend;
        bool again; // the next request asks for what is in memory already
    } cases[] = {
        {"full", [&] { return disk.fill(); }, [&] { return disk.clear(); }, false},
        {"read-only", [&] { return disk.makeReadOnly(); }, [&] { return disk.makeWritable(); },
         true},
    };

    int number = 1;
    for (const auto& each : cases) {
        SCOPED_TRACE(each.name);
        const auto annotate = [&](int value) { return answer(annotating("a", numbered(value))); };
        writeFile(home / "zpd.log", "");
        start(options);
        EXPECT_EQ(annotate(number), "");
        const std::string good = readFile(file);
        EXPECT_TRUE(good.contains(stored(number))) << good;

        ASSERT_TRUE(each.spoil());
        EXPECT_EQ(annotate(number + 1), "");
        EXPECT_TRUE(
            daemon->logs("ops error: unable to save annotations:file://" + file + " error:"));
        EXPECT_EQ(current("a"), number + 1) << "memory stands";
        EXPECT_EQ(readFile(file), good);
        for (int i = 0; i < 5; ++i) {
            Flood flood(*this, number + 100);
            (void)flood.hear();
            start(options);
            EXPECT_EQ(current("a"), number);
        }
        EXPECT_EQ(annotate(number + 2), "");
        EXPECT_EQ(readFile(file), good);

        ASSERT_TRUE(each.mend());
        EXPECT_EQ(answer(each.again ? annotating("a", numbered(number + 2))
                                    : annotating("b", Item::map({{"election", number}}))),
                  "");
        EXPECT_TRUE(readFile(file).contains(stored(number + 2))) << "the next request saves all";
        EXPECT_EQ(unfinishedFiles(home / "disk"), 0U);
        number += 10;
    }
}

} // namespace
} // namespace e2e
