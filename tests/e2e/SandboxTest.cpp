// Tokens at work: processes that cannot read a bundle by themselves read it through the broker.

#include <unistd.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr uid_t otherUser = 4712;

class Sandbox : public DaemonTest {
protected:
    Sandbox() { writeFile(bundle + "/Resources/note", "a note"); }

    [[nodiscard]] std::string token() { return findAt(*client, bundle)["extensions"]["."].text(); }

    [[nodiscard]] std::unique_ptr<Talk> probe(std::optional<uid_t> user = std::nullopt) const {
        return std::make_unique<Talk>(home, std::vector{builtProgram("e2e_sandbox_probe")}, user);
    }

    // What a token and a path give.
    [[nodiscard]] std::string opened(const std::string& token, const std::string& path) const {
        const auto talk = probe();
        const std::string consumed = talk->ask("consume " + token);
        return consumed == "consumed" ? talk->ask("open " + path) : consumed;
    }

    const std::string bundle = addAppWith(home, "Some", {});
    const std::string note = bundle + "/Resources/note";
};

TEST_F(Sandbox, ConfinedProcessesReadABundleByItsToken) {
    std::optional<uid_t> user;
    if (geteuid() == 0) { // nobody else may read it
        user = otherUser;
        ASSERT_EQ(chmod(home.path().c_str(), 0711), 0);
        ASSERT_EQ(chmod((home / "Applications/Some.app").c_str(), 0700), 0);
    }
    start();
    const auto talk = probe(user);
    EXPECT_EQ(talk->ask("confine"), "confined");
    EXPECT_EQ(talk->ask("try " + note), "EACCES");
    EXPECT_EQ(talk->ask("consume " + token()), "consumed");
    EXPECT_EQ(talk->ask("list"), ". .. Info.plist Resources plugin ");
    EXPECT_EQ(talk->ask("open Resources/note"), "a note");
    EXPECT_EQ(talk->ask("open Resources/../../Some.appex/plugin"), "EINVAL");
    EXPECT_EQ(talk->ask("open Resources/none"), "ENOENT");
    EXPECT_EQ(talk->ask("expel"), "-1");
    EXPECT_EQ(talk->ask("open Resources/note"), "EBADF");
    const std::string ofService = findAt(*client, bundle)["service-extension"].text();
    EXPECT_EQ(talk->ask("consume " + ofService), "nothing");
}

TEST_F(Sandbox, ADescriptorDoesNotLeadOutOfAMountNamespace) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can make a mount namespace alone";
    start();
    const auto talk = probe();
    EXPECT_EQ(talk->ask("unshare"), "unshared");
    EXPECT_EQ(talk->ask("consume " + token()), "consumed");
    EXPECT_EQ(talk->ask("list"), "ENOTDIR");
    EXPECT_EQ(talk->ask("open Resources/note"), "a note");
}

TEST_F(Sandbox, WhatChangedSinceTheTokenWasIssuedGivesNothing) {
    start();
    const std::string issued = token();
    ASSERT_EQ(opened(issued, "Resources/note"), "a note");
    writeFile(home / "secret/note", "a secret");
    fs::rename(bundle + "/Resources", home / "aside");
    fs::create_directory_symlink(home / "secret", bundle + "/Resources");
    EXPECT_EQ(opened(issued, "Resources/note"), "ELOOP");
    EXPECT_EQ(opened(issued, "Resources"), "ELOOP");
    fs::rename(bundle, home / "bundle");
    fs::create_directory_symlink(home / "secret", bundle);
    EXPECT_EQ(opened(issued, "note"), "nothing");
    fs::remove(bundle);
    fs::remove(home / "bundle/Resources");
    fs::rename(home / "aside", home / "bundle/Resources");
    fs::rename(home / "bundle", bundle);
    ASSERT_TRUE(eventually([&] { return opened(issued, "Resources/note") == "a note"; }));

    restart();
    EXPECT_EQ(opened(issued, "Resources/note"), "nothing") << "replayed";
    EXPECT_TRUE(daemon->logs("the token does not count"));
    const std::string fresh = token();
    EXPECT_EQ(opened(fresh, "Resources/note"), "a note");
    fs::remove_all(home / "Applications/Some.app");
    EXPECT_TRUE(eventually([&] { return opened(fresh, "Resources/note") == "nothing"; }));
}

} // namespace
} // namespace e2e
