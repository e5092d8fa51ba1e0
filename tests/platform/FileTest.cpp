#include "platform/file/File.h"

#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/file/Mounts.h"
#include "platform/file/OwnershipTest.h"
#include "tests/platform/TestFolder.h"

namespace fs = std::filesystem;
using namespace platform;

TEST(ReadRegularFile, TellsWhyAFileCannotBeRead) {
    const TestFolder folder;
    ASSERT_EQ(::mkfifo((folder / "fifo").c_str(), 0600), 0);
    folder.write("big", std::string(101, 'x'));
    folder.write("plain", "");

    const std::pair<std::string, std::int64_t> cases[] = {
        {folder / "missing", fileErrorNoSuchFile},
        {folder / "fifo", fileErrorNotRegular},
        {folder.path(), fileErrorNotRegular},
        {"/dev/zero", fileErrorNotRegular},
        {folder / "big", fileErrorTooLarge},
        {folder / "plain/below", fileErrorReadUnknown},
        {(folder / "plain") + std::string("\0x", 2), fileErrorReadUnknown},
    };

    for (const auto& [path, code] : cases) {
        const auto content = readRegularFile(path, 100);
        ASSERT_FALSE(content) << path;
        EXPECT_EQ(content.error().code, code) << path;
        EXPECT_TRUE(content.error().description->find(path) == 0);
    }
}

TEST(ReadRegularFile, ReadsUpToItsLimit) {
    const TestFolder folder;
    for (const std::size_t size : {0, 1, 99, 100}) {
        const auto path = folder.write("file", std::string(size, 'y'));
        const auto content = readRegularFile(path, 100);
        ASSERT_TRUE(content) << size;
        EXPECT_EQ(content->bytes, std::string(size, 'y'));
        EXPECT_EQ(content->stamp, stampOf(path));
    }
    EXPECT_FALSE(readRegularFile("/proc/self/maps", 10)) << "of unknown size, but longer";
}

TEST(FileStamp, TellsAChangedFile) {
    const TestFolder folder;
    const auto path = folder.write("file", "one");
    const auto first = stampOf(path);
    ASSERT_TRUE(first);
    EXPECT_FALSE(first->settled()) << "written just now";
    ::usleep(30'000);
    EXPECT_TRUE(first->settled());
    folder.write("file", "two");
    EXPECT_NE(stampOf(path), first);
    EXPECT_FALSE(stampOf(folder / "missing"));
}

TEST(WriteFileAtomically, ReplacesContentAndModeWhole) {
    const TestFolder folder;
    const auto path = folder.write("store", "old");
    ASSERT_FALSE(writeFileAtomically(path, "new content", 0640));
    EXPECT_EQ(readRegularFile(path, 100)->bytes, "new content");
    EXPECT_EQ(fs::status(path).permissions(), fs::perms(0640));
    EXPECT_EQ(std::distance(fs::directory_iterator(folder.path()), {}), 1) << "nothing beside it";
}

TEST(WriteFileAtomically, LeavesTheOldFileAloneOnFailure) {
    const TestFolder folder;
    fs::create_directories(folder / "taken/inside");
    EXPECT_TRUE(writeFileAtomically(folder / "taken", "x")) << "a folder stands in its place";
    EXPECT_TRUE(writeFileAtomically(folder / "missing/file", "x"));
    EXPECT_TRUE(writeFileAtomically("", "x"));
    EXPECT_TRUE(writeFileAtomically((folder / "a") + std::string("\0b", 2), "x"));
    EXPECT_EQ(std::distance(fs::directory_iterator(folder.path()), {}), 1) << "nothing left over";
}

TEST(WriteFileAtomically, LeftOversGoUnlessSomebodyWritesThem) {
    const TestFolder folder;
    const auto path = folder.write("store", "kept");
    folder.write(".store.new-killed", "");
    const auto written = folder.write(".store.new-alive1", "");
    const UniqueFd writer(::open(written.c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_EQ(::flock(writer.get(), LOCK_EX), 0);
    const auto other = folder.write(".store.new-another", "");
    const auto others = folder.write(".other.new-123456", "");
    ASSERT_EQ(::mkfifo((folder / ".store.new-fifo12").c_str(), 0600), 0);
    fs::create_symlink("store", folder / ".store.new-linked");
    removeUnfinishedFiles(path);
    EXPECT_FALSE(fs::exists(folder / ".store.new-killed"));
    EXPECT_EQ(std::distance(fs::directory_iterator(folder.path()), {}), 6);
    removeUnfinishedFiles(folder / "missing/store");
}

TEST(CanonicalPath, ResolvesOnlyWhatIsThere) {
    const TestFolder folder;
    const auto file = folder.write("real/file", "");
    fs::create_directory_symlink("real", folder / "link");
    fs::create_symlink("loop", folder / "loop");
    EXPECT_EQ(canonicalPath(folder / "link/../real/./file"), file);
    EXPECT_EQ(canonicalPath(folder / "link/file"), file);
    EXPECT_EQ(canonicalPath(folder / "missing").error(), ENOENT);
    EXPECT_EQ(canonicalPath(folder / "loop").error(), ELOOP);
    EXPECT_EQ(canonicalPath(file + std::string("\0x", 2)).error(), ENOENT);
    EXPECT_EQ(canonicalPath("").error(), ENOENT);
    std::string winding = folder.path();
    while (winding.size() < PATH_MAX)
        winding += "/../" + fs::path(folder.path()).filename().string();
    EXPECT_EQ(canonicalPath(winding).error(), ENAMETOOLONG);
}

TEST(MakeFolders, MakesWhatIsMissing) {
    const TestFolder folder;
    EXPECT_FALSE(makeFolders(folder / "a/b//c", 0755));
    EXPECT_TRUE(fs::is_directory(folder / "a/b/c"));
    EXPECT_FALSE(makeFolders(folder / "a/b/c/", 0755)) << "it is there";
    folder.write("a/file", "");
    EXPECT_TRUE(makeFolders(folder / "a/file/d", 0755));
    EXPECT_TRUE(makeFolders(folder / "a/file", 0755));
}

TEST(OwnershipTest, RefusesWhatOthersCanChange) {
    const TestFolder folder;
    const auto file = folder.write("outer/inner/file", "");

    const std::tuple<const char*, mode_t, bool> cases[] = {
        {"outer/inner/file", 0644, true},
        {"outer/inner/file", 0664, false},
        {"outer/inner/file", 0646, false},
        {"outer/inner/file", 01666, false},
        {"outer/inner", 0777, false},
        {"outer/inner", 01777, true},
        {"outer", 0775, false},
        {"outer", 01775, true},
    };

    for (const auto& [changed, mode, passes] : cases) {
        fs::permissions(file, fs::perms(0644));
        fs::permissions(folder / "outer/inner", fs::perms(0755));
        fs::permissions(folder / "outer", fs::perms(0755));
        ASSERT_EQ(::chmod((folder / changed).c_str(), mode), 0);
        const auto reason = OwnershipTest().refusal(file);
        EXPECT_EQ(!reason, passes) << changed << " " << std::oct << mode;
        EXPECT_EQ(reason.value_or(""),
                  passes ? "" : (folder / changed) + " can be written by others");
    }
    EXPECT_TRUE(OwnershipTest().refusal(folder / "missing"));
    EXPECT_TRUE(OwnershipTest().refusal("relative"));
}

TEST(Mounts, ThatProgramsServeAreToldByTheirType) {
    const std::string_view info =
        "27 1 254:0 / / rw - ext4 /dev/vda rw\n"
        "270 27 0:40 / /tmp/a\\040-\\040x rw,nosuid shared:3 - fuse.sshfs a rw\n"
        "28 27 0:41 / /b rw - tmpfs fuse rw\n";
    const std::pair<std::uint64_t, bool> cases[] = {
        {27, false}, {270, true}, {28, false}, {2, true}, {29, true}};
    for (const auto& [mount, served] : cases)
        EXPECT_EQ(isServedByProgram(mount, info), served) << mount;
}

std::uint64_t mountAt(const std::string& path) {
    struct ::statx seen = {};
    EXPECT_EQ(::statx(AT_FDCWD, path.c_str(), 0, STATX_MNT_ID, &seen), 0);
    return seen.stx_mnt_id;
}

TEST(Mounts, AreKnownAsTheyAreNow) {
    const TestFolder folder;
    ASSERT_FALSE(isServedByProgram(mountAt("/proc")));
    if (::mount("none", folder.path().c_str(), "tmpfs", 0, nullptr) != 0)
        GTEST_SKIP() << "may not mount";
    const std::uint64_t mount = mountAt(folder.path());
    EXPECT_FALSE(isServedByProgram(mount));
    ASSERT_EQ(::umount2(folder.path().c_str(), MNT_DETACH), 0);
    EXPECT_TRUE(isServedByProgram(mount)) << "nothing is known of it any more";
}

TEST(OwnershipTest, RefusesWhatBelongsToAnotherUser) {
    struct ::stat status = {};
    status.st_mode = S_IFREG | 0644;
    status.st_uid = 0;
    EXPECT_FALSE(OwnershipTest::refusalOf(status, "/f"));
    status.st_uid = ::geteuid();
    EXPECT_FALSE(OwnershipTest::refusalOf(status, "/f"));
    status.st_uid = ::geteuid() + 1;
    EXPECT_EQ(OwnershipTest::refusalOf(status, "/f"),
              "/f belongs to user " + std::to_string(status.st_uid));
    status.st_mode = S_IFDIR | 01777;
    EXPECT_TRUE(OwnershipTest::refusalOf(status, "/d")) << "its owner could rename in it";
}
