#include "platform/sandbox/SandboxBroker.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <linux/landlock.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/sandbox/BrokerClient.h"
#include "platform/sandbox/HmacSandbox.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"
#include "tests/support/LogOf.h"

namespace {

using namespace platform;
namespace fs = std::filesystem;

// A broker of one registered bundle, and a client.
class SandboxBrokerTest : public testing::Test {
protected:
    using Kind = SandboxGrant::Kind;

    SandboxBrokerTest() {
        folder_.write("Bundle/file", "content");
        folder_.write("Bundle/Resources/deep/file", "deep");
        folder_.write("outside", "secret");
        auto made = SandboxBroker::create(
            socket_, sandbox_,
            {.isInRegisteredBundle = [this](const auto& path) { return path.starts_with(bundle_); },
             .isShutOut = [this](const ipc::Peer&) { return shutOut_.load(); }});
        EXPECT_TRUE(made);
        broker_ = std::move(*made);
        broker_->resume();
    }

    [[nodiscard]] std::string token(const std::string& path,
                                    std::string_view ofClass = Sandbox::readOnlyClass,
                                    std::uint32_t flags = Sandbox::canonicalPathFlag) {
        return sandbox_.issueFileExtension(ofClass, path, flags).value_or("none");
    }

    // What can be read by a token: the content, or the errno value.
    [[nodiscard]] std::string consumed(const std::string& token) {
        const auto handle = client_.consume(token);
        return handle ? contentOf(UniqueFd(static_cast<int>(*handle))) : errorText(handle.error());
    }

    [[nodiscard]] std::string opened(const std::string& token, const std::string& path) {
        const auto file = client_.open(token, path);
        return file ? contentOf(*file) : errorText(file.error());
    }

    [[nodiscard]] static std::string errorText(int number) { return strerrorname_np(number); }

    [[nodiscard]] static std::string contentOf(const UniqueFd& file) {
        EXPECT_EQ(::fcntl(file.get(), F_GETFL) & O_ACCMODE, O_RDONLY);
        EXPECT_EQ(::fcntl(file.get(), F_GETFD), FD_CLOEXEC);
        char room[64];
        const ssize_t size = ::read(file.get(), room, sizeof room);
        return size < 0 ? errorText(errno) : std::string(room, static_cast<std::size_t>(size));
    }

    const TestFolder folder_;
    const std::string bundle_ = folder_ / "Bundle";
    const std::string socket_ = folder_ / "run/sandbox";
    std::atomic<bool> shutOut_ = false;
    HmacSandbox sandbox_;
    std::unique_ptr<SandboxBroker> broker_;
    BrokerClient client_{socket_};
};

TEST_F(SandboxBrokerTest, GivesFilesAndFoldersToRead) {
    EXPECT_EQ(consumed(token(bundle_ + "/file")), "content");
    EXPECT_EQ(consumed(token(bundle_)), "EISDIR");
    const std::string whole = token(bundle_);
    for (const auto& [path, content] : {std::pair("file", "content"),
                                        {"./Resources//deep/file", "deep"},
                                        {"Resources", "EISDIR"},
                                        {".", "EISDIR"},
                                        {"none", "ENOENT"},
                                        {"file/below", "ENOTDIR"},
                                        {"", "EINVAL"},
                                        {"/etc/passwd", "EINVAL"},
                                        {"..", "EINVAL"},
                                        {"Resources/../file", "EINVAL"},
                                        {"../outside", "EINVAL"},
                                        {"Resources/deep/../../../outside", "EINVAL"}})
        EXPECT_EQ(opened(whole, path), content) << path;
    EXPECT_EQ(opened(whole, std::string("file\0x", 6)), "EINVAL");
    EXPECT_EQ(opened(token(bundle_ + "/file"), "x"), "ENOTDIR");
    const auto handle = client_.consume(whole);
    ASSERT_TRUE(handle);
    EXPECT_EQ(client_.release(*handle), 0);
    EXPECT_EQ(client_.release(*handle), EBADF);
    EXPECT_EQ(client_.release(-1), EBADF);
}

// The calling thread can open nothing to read from here on.
bool confineThread() {
    landlock_ruleset_attr nothing{};
    nothing.handled_access_fs = LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR;
    const UniqueFd rules(static_cast<int>(
        ::syscall(SYS_landlock_create_ruleset, &nothing, sizeof nothing.handled_access_fs, 0)));
    return rules && ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           ::syscall(SYS_landlock_restrict_self, rules.get(), 0) == 0;
}

TEST_F(SandboxBrokerTest, GivesWhatTheClientCouldNotOpen) {
    const std::string file = token(bundle_ + "/file");
    const std::string whole = token(bundle_);
    std::jthread([&] {
        ASSERT_TRUE(confineThread());
        EXPECT_FALSE(UniqueFd(::open((bundle_ + "/file").c_str(), O_RDONLY)));
        EXPECT_EQ(consumed(file), "content");
        EXPECT_EQ(opened(whole, "Resources/deep/file"), "deep");
        EXPECT_EQ(opened(whole, "../outside"), "EINVAL");
    }).join();
}

TEST_F(SandboxBrokerTest, GivesNothingForOtherTokens) {
    const std::string good = token(bundle_ + "/file");
    HmacSandbox earlier;
    const std::tuple<const char*, std::string, const char*> cases[] = {
        {"none", "", "EACCES"},
        {"forged", good.substr(0, good.size() - 64) + std::string(64, '0'), "EACCES"},
        {"altered",
         "zsx1;com.tovana.app-sandbox.read;1;file;/etc/passwd" + good.substr(good.rfind(';')),
         "EACCES"},
        {"truncated", good.substr(0, good.size() - 1), "EACCES"},
        {"of an earlier start",
         *earlier.issueFileExtension(Sandbox::readOnlyClass, bundle_ + "/file", 1), "EACCES"},
        {"of another class", token(bundle_ + "/file", "com.tovana.app-sandbox.read-write"),
         "EACCES"},
        {"of no canonical path", token(bundle_ + "/../outside", Sandbox::readOnlyClass, 0),
         "EACCES"},
        {"for a service",
         *sandbox_.issueServiceExtension("com.tovana.zephrin.plugin-service", bundle_, 0),
         "EACCES"},
        {"for reading services",
         *sandbox_.issueServiceExtension(Sandbox::readOnlyClass, bundle_ + "/file", 1), "EACCES"},
        {"for what is in no bundle", token(folder_ / "outside"), "ENOENT"},
    };
    const std::string log = logOf([&] {
        for (const auto& [what, bad, error] : cases) {
            EXPECT_EQ(consumed(bad), error) << what;
            EXPECT_EQ(opened(bad, "file"), error) << what;
        }
        for (int i = 0; i < 100; ++i)
            EXPECT_EQ(consumed("x"), "EACCES");
    });
    EXPECT_LT(std::count(log.begin(), log.end(), '\n'), 100)
        << "not a line for each of a flood: " << log;
    EXPECT_EQ(log.find("zsx1"), std::string::npos) << log;
    EXPECT_EQ(consumed(good), "content");
    shutOut_ = true;
    EXPECT_EQ(consumed(good), "ECONNRESET");
    broker_->stop();
    EXPECT_EQ(consumed(good), "ENOENT");
}

TEST_F(SandboxBrokerTest, GivesNothingThatOthersCouldHavePutThere) {
    const std::string whole = token(bundle_);
    const std::string file = token(bundle_ + "/file");
    fs::create_symlink(bundle_ + "/file", bundle_ + "/link");
    EXPECT_EQ(opened(whole, "link"), "ELOOP");
    makeFifo(bundle_ + "/fifo");
    EXPECT_EQ(opened(whole, "fifo"), "EACCES");
    fs::create_hard_link(folder_ / "outside", bundle_ + "/hard");
    EXPECT_EQ(opened(whole, "hard"), "secret") << "only who owns the bundle could do that";
    setMode(bundle_, 01777);
    EXPECT_EQ(opened(whole, "hard"), "EACCES") << "anybody could";
    EXPECT_EQ(opened(whole, "Resources/deep/file"), "deep") << "nobody could replace those";
    setMode(bundle_, 0775);
    EXPECT_EQ(opened(whole, "hard"), "EACCES");
    EXPECT_EQ(consumed(whole), "EACCES");
    setMode(bundle_, 0755);
    setMode(bundle_ + "/file", 0666);
    EXPECT_EQ(consumed(file), "EACCES") << "it could be opened again, to write";
    fs::remove(bundle_ + "/file");
    fs::create_symlink(folder_ / "outside", bundle_ + "/file");
    EXPECT_EQ(consumed(file), "ELOOP");
    fs::rename(bundle_, folder_ / "aside");
    fs::create_directory_symlink(folder_ / "aside", bundle_);
    EXPECT_EQ(consumed(whole), "ELOOP");
    EXPECT_EQ(opened(whole, "Resources/deep/file"), "ELOOP");
    if (::geteuid() == 0) {
        giveAway(folder_ / "aside/Resources");
        EXPECT_EQ(opened(token(folder_ / "aside"), "Resources/deep/file"), "ENOENT");
        fs::remove(bundle_);
        fs::rename(folder_ / "aside", bundle_);
        EXPECT_EQ(opened(whole, "Resources/deep/file"), "EACCES") << "another's folder";
    }
}

} // namespace
