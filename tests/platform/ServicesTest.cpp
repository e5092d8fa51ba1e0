// The small services that keep their state in files.

#include <cerrno>
#include <csignal>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/container/FolderContainers.h"
#include "platform/notify/FileNotifications.h"
#include "platform/plist/PropertyList.h"
#include "platform/preferences/FilePreferences.h"
#include "platform/process/ProcProcesses.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"
#include "tests/support/Gate.h"
#include "tests/support/PeerOfProcess.h"

namespace fs = std::filesystem;
using namespace platform;

namespace {

std::uint64_t counterIn(const std::string& path) {
    std::uint64_t count = 0;
    const std::string content = contentOf(path);
    for (std::size_t i = 0; i < 8; ++i)
        count |= std::uint64_t{static_cast<std::uint8_t>(content.at(i))} << (8 * i);
    return count;
}

} // namespace

TEST(FilePreferences, ReadWhatCanBeTrustedAgainWhenItChanged) {
    const TestFolder folder;
    FilePreferences preferences(folder.path());
    const auto write = [&](const Value& list) {
        return folder.write("com.x.plist", *plist::writeXml(list));
    };
    const auto synchronized = [&] {
        preferences.synchronize("com.x");
        return preferences.value("com.x", "key");
    };
    EXPECT_FALSE(preferences.value("com.x", "key"));
    const std::string file = write(Dictionary{{"key", 1}});
    EXPECT_FALSE(preferences.value("com.x", "key")) << "not before synchronize";
    EXPECT_EQ(synchronized(), Value(1));
    EXPECT_FALSE(preferences.value("com.x", "other"));
    EXPECT_FALSE(preferences.value("com.y", "key"));
    write(Dictionary{{"key", 2}});
    EXPECT_EQ(synchronized(), Value(2)) << "of the same size, a moment later";
    setMode(file, 0666);
    EXPECT_FALSE(synchronized()) << "others could have written it";
    setMode(file, 0644);
    EXPECT_EQ(synchronized(), Value(2));
    for (const std::string& content : {std::string("broken"), *plist::writeXml(Array{1})}) {
        folder.write("com.x.plist", content);
        EXPECT_FALSE(synchronized()) << content;
    }
    write(Dictionary{{"key", 3}});
    EXPECT_EQ(synchronized(), Value(3));
    fs::remove(file);
    EXPECT_FALSE(synchronized());
    for (const char* domain : {"", "../x", "a/b"}) {
        preferences.synchronize(domain);
        EXPECT_FALSE(preferences.value(domain, "key"));
    }
}

TEST(FileNotifications, CountEachPost) {
    const TestFolder folder;
    const Umask umask(077);
    FileNotifications notifications(folder / "run/notify");
    notifications.post("com.x.changed");
    EXPECT_EQ(counterIn(folder / "run/notify/com.x.changed"), 1U);
    EXPECT_EQ(modeOf(folder / "run/notify"), 0755U) << "everybody may watch";
    EXPECT_EQ(modeOf(folder / "run/notify/com.x.changed"), 0644U);
    inThreads(4, [&](int) {
        for (int i = 0; i < 100; ++i)
            notifications.post("com.x.changed");
    });
    EXPECT_EQ(counterIn(folder / "run/notify/com.x.changed"), 401U);
}

TEST(FileNotifications, NeverWaitAndNeverLeaveTheirFolder) {
    const TestFolder folder;
    fs::create_directories(folder / "notify");
    makeFifo(folder / "notify/pipe");
    folder.write("target", "");
    fs::create_symlink("../target", folder / "notify/link");
    FileNotifications notifications(folder / "notify");
    for (const char* name : {"pipe", "link", "../target", "", "."})
        notifications.post(name);
    EXPECT_EQ(fs::file_size(folder / "target"), 0U);
    notifications.post("fine");
    EXPECT_EQ(counterIn(folder / "notify/fine"), 1U);
}

TEST(FolderContainers, MakesAPrivateFolderOnce) {
    const TestFolder folder;
    FolderContainers containers(folder / "lib/Containers");
    const auto made = containers.dataContainer("com.x.app", std::nullopt);
    ASSERT_TRUE(made);
    EXPECT_EQ(*made, folder / "lib/Containers/com.x.app");
    EXPECT_EQ(modeOf(*made), 0700U);
    EXPECT_EQ(modeOf(*made + "/tmp"), 0700U);
    folder.write("lib/Containers/com.x.app/file", "kept");
    EXPECT_EQ(containers.dataContainer("com.x.app", std::nullopt).value_or("none"), *made);
    EXPECT_TRUE(fs::exists(*made + "/file"));
}

TEST(FolderContainers, RefusesWhatWouldLeadElsewhere) {
    const TestFolder folder;
    FolderContainers containers(folder / "Containers");
    fs::create_directories(folder / "elsewhere");
    fs::create_directories(folder / "Containers");
    fs::create_directory_symlink("../elsewhere", folder / "Containers/link");
    folder.write("Containers/file", "");
    const std::string_view identifiers[] = {
        "", ".", "..", "a/b", "/a", std::string_view("a\0b", 3), "a\nb", "link", "file"};
    for (const auto identifier : identifiers)
        EXPECT_FALSE(containers.dataContainer(identifier, std::nullopt)) << identifier;
    EXPECT_FALSE(containers.dataContainer(std::string(256, 'a'), std::nullopt));
    EXPECT_TRUE(containers.dataContainer(std::string(255, 'a'), std::nullopt));
    EXPECT_TRUE(fs::is_empty(folder / "elsewhere"));
}

TEST(ProcProcesses, TellTheRunningFileAtItsOwnPath) {
    ProcProcesses processes;
    const ipc::Peer self = peerOfProcess(::getpid());
    const auto own = processes.executablePath(self, 4096);
    ASSERT_TRUE(own);
    EXPECT_EQ(*own, fs::read_symlink("/proc/self/exe"));
    EXPECT_EQ(processes.executablePath(self, own->size() + 1), own);
    EXPECT_EQ(processes.executablePath(self, own->size()).error(), ENAMETOOLONG);
    EXPECT_EQ(processes.executablePath(ipc::Peer{}, 4096).error(), ESRCH);
}

TEST(ProcProcesses, DoNotNameAFileThatIsAnotherByNow) {
    const TestFolder folder;
    const std::string program = folder / "sleeper";
    fs::copy_file("/bin/sleep", program);
    const pid_t child = ::fork();
    if (child == 0) {
        ::execl(program.c_str(), "sleeper", "60", nullptr);
        ::_exit(127);
    }
    ProcProcesses processes;
    ipc::Peer peer = peerOfProcess(child);
    for (int i = 0; i < 500 && processes.executablePath(peer, 4096) != program; ++i) {
        ::usleep(10'000);
        peer = peerOfProcess(child);
    }
    EXPECT_EQ(processes.executablePath(peer, 4096), program);
    EXPECT_TRUE(ipc::runsItsExecutable(peer));
    fs::remove(program);
    EXPECT_EQ(processes.executablePath(peer, 4096).error(), ENOENT) << "deleted";
    fs::copy_file("/bin/sleep", program);
    EXPECT_EQ(processes.executablePath(peer, 4096).error(), ENOENT) << "replaced";
    EXPECT_TRUE(ipc::runsItsExecutable(peer));
    peer.executable = peerOfProcess(::getpid()).executable;
    EXPECT_FALSE(ipc::runsItsExecutable(peer)) << "became another program";
    ::kill(child, SIGKILL);
    ::waitpid(child, nullptr, 0);
    EXPECT_FALSE(ipc::isAlive(peer));
}
