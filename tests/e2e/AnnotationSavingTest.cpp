#include <algorithm>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
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

namespace fs = std::filesystem;

const std::vector<std::string> identifiers = {"a", "b", "c"};
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
        alignas(inotify_event) char room[4096];
        for (ssize_t size = 0; (size = read(fd_, room, sizeof room)) > 0;) {
            for (const char* at = room; at < room + size; ++events) {
                const auto* const event = reinterpret_cast<const inotify_event*>(at);
                at += sizeof(inotify_event) + event->len;
            }
        }
        return events;
    }

private:
    int fd_;
};

// Requests of one client, all at once, each with another number for one of the plug-ins.
class Flood {
public:
    Flood(AnnotatedHome& world, int first) : client_(*world.client) {
        for (int i = 0; i < pipelined; ++i) {
            const std::string& identifier = identifiers[static_cast<std::size_t>(i) % 3];
            asked_[client_.post(world.annotating(identifier, numbered(first + i)))] = {identifier,
                                                                                       first + i};
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

TEST(AnnotationSaving, KeepsWhatWasAcknowledgedWhenTheDaemonIsKilled) {
    constexpr int rounds = 50;
    AnnotatedHome world(identifiers);
    int number = 1;
    for (int round = 0; round < rounds; ++round, number += pipelined) {
        const int signal = round % 10 == 9 ? SIGTERM : SIGKILL;
        Flood flood(world, number);
        for (int heard = 0; heard < round && flood.hear();)
            ++heard;
        std::this_thread::sleep_for(std::chrono::microseconds(round % 7 * 50));
        world.daemon->program().signal(signal);
        while (flood.hear()) {}
        EXPECT_EQ(world.daemon->program().exitStatus(), signal == SIGTERM ? 0 : 128 + SIGKILL);
        if (signal == SIGTERM) {
            EXPECT_EQ(unfinishedFiles(world.home.path()), 0U);
        }
        world.restart();
        const auto kept = world.annotations();
        for (const auto& [identifier, acknowledged] : flood.acknowledged) {
            const auto found = kept.at(identifier)["extension"]["number"].number();
            EXPECT_GE(found, static_cast<std::uint64_t>(acknowledged)) << identifier;
            EXPECT_LT(found, static_cast<std::uint64_t>(number + pipelined)) << identifier;
        }
        EXPECT_EQ(unfinishedFiles(world.home.path()), 0U);
    }
    EXPECT_EQ(world.daemon->linesWith("unable to load annotation database"), 0U);
}

TEST(AnnotationSaving, OneSaveServesAllWhoWait) {
    AnnotatedHome world(identifiers);
    const Replacements saves(world.home.path());
    Flood flood(world, 1);
    for (int i = 0; i < pipelined; ++i)
        ASSERT_TRUE(flood.hear());
    const int count = saves.count();
    EXPECT_GT(count, 0);
    EXPECT_LT(count, pipelined / 2);
    EXPECT_EQ(flood.acknowledged.at("b"), pipelined);

    (void)world.client->request(world.annotating("b", numbered(pipelined)));
    EXPECT_EQ(saves.count(), 0) << "nothing changed";
    Item every = world.annotating("a", numbered(5000));
    Item uuids = Item::array({});
    for (const std::string& identifier : identifiers)
        uuids.append(Item::uuid(world.uuids.at(identifier)));
    (void)world.client->request(every.set("uuids", uuids));
    EXPECT_EQ(saves.count(), 1);
}

TEST(AnnotationSaving, DiscoveriesWaitForTheElectionsThatTheyMake) {
    const Home home;
    const Signer signer(home);
    const std::string app = home.addApp("Some");
    for (const std::string& identifier : identifiers) {
        signer.sign(addPlugIn(app, identifier, {.identifier = identifier}),
                    Item::map({{"com.tovana.developer.auto-elect-plugin", true}}));
    }
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const Replacements saves(home.path());
    EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), "a b c");
    EXPECT_EQ(saves.count(), 1);
    EXPECT_TRUE(readFile(home / "annotations").contains("<key>c</key>"));
    EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), "a b c");
    EXPECT_EQ(saves.count(), 0);
}

// A small file system that only this process and what it starts can see.
class SmallDisk {
public:
    explicit SmallDisk(std::string folder) : folder_(std::move(folder)) {
        fs::create_directory(folder_);
        ready_ = unshare(CLONE_NEWNS) == 0 &&
                 mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                 mount("none", folder_.c_str(), "tmpfs", 0, "size=64k,mode=755") == 0;
        reason_ = std::strerror(errno);
    }

    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;

    ~SmallDisk() { umount2(folder_.c_str(), MNT_DETACH); }

    [[nodiscard]] bool ready() const { return ready_; }

    [[nodiscard]] const std::string& reason() const { return reason_; }

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

private:
    [[nodiscard]] std::string filler() const { return folder_ + "/filler"; }

    [[nodiscard]] bool remount(unsigned long flags) const {
        return mount(nullptr, folder_.c_str(), nullptr, MS_REMOUNT | flags, nullptr) == 0;
    }

    std::string folder_;
    bool ready_ = false;
    std::string reason_;
};

TEST(AnnotationSaving, OutlivesADiskThatIsFullOrReadOnly) {
    AnnotatedHome world(identifiers);
    const SmallDisk disk(world.home / "disk");
    if (!disk.ready())
        GTEST_SKIP() << "cannot mount a file system here: " << disk.reason();
    const std::string file = world.home / "disk/annotations";
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
        const auto annotate = [&](int value) {
            return errorOf(world.client->request(world.annotating("a", numbered(value))));
        };
        const auto current = [&] {
            return world.annotations().at("a")["extension"]["number"].number();
        };
        writeFile(world.home / "zpd.log", "");
        world.restart(options);
        EXPECT_EQ(annotate(number), "");
        const std::string good = readFile(file);
        EXPECT_TRUE(good.contains(stored(number))) << good;

        ASSERT_TRUE(each.spoil());
        EXPECT_EQ(annotate(number + 1), "");
        EXPECT_TRUE(
            world.daemon->logs("ops error: unable to save annotations:file://" + file + " error:"));
        EXPECT_EQ(current(), static_cast<std::uint64_t>(number) + 1) << "memory stands";
        EXPECT_EQ(readFile(file), good);
        for (int i = 0; i < 5; ++i) {
            Flood flood(world, number + 100);
            (void)flood.hear();
            world.restart(options);
            EXPECT_EQ(current(), static_cast<std::uint64_t>(number));
        }
        EXPECT_EQ(annotate(number + 2), "");
        EXPECT_EQ(readFile(file), good);

        ASSERT_TRUE(each.mend());
        const Item next = each.again ? world.annotating("a", numbered(number + 2))
                                     : world.annotating("b", Item::map({{"election", number}}));
        EXPECT_EQ(errorOf(world.client->request(next)), "");
        EXPECT_TRUE(readFile(file).contains(stored(number + 2))) << "the next request saves all";
        EXPECT_EQ(unfinishedFiles(world.home / "disk"), 0U);
        number += 10;
    }
}

} // namespace
} // namespace e2e
