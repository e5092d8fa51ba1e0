#include <cerrno>
#include <filesystem>
#include <set>
#include <unistd.h>

#include <gmock/gmock.h>

#include "platform/sandbox/Confinement.h"
#include "platform/sandbox/HmacSandbox.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/PeerOfProcess.h"

using namespace platform;
using namespace testing;

TEST(HmacSandbox, IssuesTheSameTextForTheSameThing) {
    const TestFolder folder;
    folder.write("A b;c/file", "");
    std::filesystem::create_directory_symlink("A b;c", folder / "link");
    HmacSandbox sandbox;
    const auto issue = [&](const std::string& path, std::uint32_t flags) {
        return sandbox.issueFileExtension(Sandbox::readOnlyClass, path, flags).value_or("none");
    };
    const std::string token = issue(folder / "A b;c", Sandbox::canonicalPathFlag);
    EXPECT_THAT(token, StartsWith("zsx1;com.tovana.app-sandbox.read;1;file;" + folder.path() +
                                  "/A%20b%3bc;"));
    EXPECT_THAT(token, MatchesRegex(".*;[0-9a-f]{64}"));
    EXPECT_EQ(issue(folder / "link/../A b;c/", Sandbox::canonicalPathFlag), token);
    HmacSandbox other;
    EXPECT_NE(other.issueFileExtension(Sandbox::readOnlyClass, folder / "A b;c",
                                       Sandbox::canonicalPathFlag),
              token)
        << "another start, another secret";
}

TEST(HmacSandbox, NeverIssuesOneTextForTwoThings) {
    HmacSandbox sandbox;
    std::set<std::string> tokens;
    const auto add = [&](const std::expected<std::string, int>& token) {
        ASSERT_TRUE(token);
        EXPECT_TRUE(tokens.insert(*token).second) << *token;
    };
    add(sandbox.issueFileExtension("a", "/x", 0));
    add(sandbox.issueFileExtension("b", "/x", 0));
    add(sandbox.issueFileExtension("a", "/y", 0));
    add(sandbox.issueFileExtension("a", "/x", 2));
    add(sandbox.issueFileExtension("a", "/%78", 0));
    add(sandbox.issueFileExtension("a;0;file;/x", "/x", 0));
    add(sandbox.issueServiceExtension("a", "/x", 0));
    add(sandbox.issueServiceExtension("a", "/x;0", 0));
}

TEST(HmacSandbox, VerifiesOnlyWhatItIssuedItself) {
    HmacSandbox sandbox;
    const std::string path("/A b;c/%41\n\x80");
    const std::string token = sandbox.issueFileExtension("a;b", path, 0xA2).value_or("none");
    EXPECT_EQ(sandbox.verify(token), (SandboxGrant{"a;b", 0xA2, SandboxGrant::Kind::file, path}));
    const auto service = sandbox.issueServiceExtension("c", "com.example", 0);
    EXPECT_EQ(sandbox.verify(service.value_or("none")),
              (SandboxGrant{"c", 0, SandboxGrant::Kind::service, "com.example"}));
    const HmacSandbox later;
    EXPECT_FALSE(later.verify(token)) << "another start, another secret";

    for (std::size_t at = 0; at < token.size(); ++at) {
        std::string altered = token;
        altered[at] = static_cast<char>(altered[at] ^ 1);
        EXPECT_FALSE(sandbox.verify(altered)) << altered;
        EXPECT_FALSE(sandbox.verify(token.substr(0, at))) << at;
    }
    const std::string mac = token.substr(token.rfind(';'));
    const std::string otherMac = service->substr(service->rfind(';'));
    for (const std::string& forged :
         {token + "0", token + ";", token + std::string(1, '\0'), " " + token, otherMac, mac,
          token.substr(0, token.rfind(';')) + otherMac, std::string(1UL << 20, ';')})
        EXPECT_FALSE(sandbox.verify(forged)) << forged.substr(0, 200);
}

TEST(SandboxGrant, HasOneTextOnly) {
    const std::string good = "zsx1;a;1;file;/x%3by";
    ASSERT_TRUE(SandboxGrant::parse(good));
    EXPECT_EQ(SandboxGrant::parse(good)->text(), good);
    for (const char* bad :
         {"", ";;;;", "zsx2;a;1;file;/x", "zsx1;a;1;file", "zsx1;a;1;file;/x;y",
          "zsx1;a;01;file;/x", "zsx1;a;;file;/x", "zsx1;a;100000000;file;/x", "zsx1;a;-1;file;/x",
          "zsx1;a;1;mach;/x", "zsx1;a;1;file;/x%3By", "zsx1;a;1;file;/x%", "zsx1;a;1;file;/x%3",
          "zsx1;a;1;file;/%78", "zsx1;a;1;file;/x%zz", "zsx1;a;1;file;/x y"})
        EXPECT_FALSE(SandboxGrant::parse(bad)) << bad;
}

TEST(HmacSandbox, RefusesWhatIsNotThere) {
    const TestFolder folder;
    HmacSandbox sandbox;
    const auto file = [&](std::string_view path, std::uint32_t flags) {
        const auto token = sandbox.issueFileExtension("a", path, flags);
        return token ? 0 : token.error();
    };
    EXPECT_EQ(file(folder / "missing", Sandbox::canonicalPathFlag), ENOENT);
    EXPECT_EQ(file(folder.path() + std::string("\0x", 2), Sandbox::canonicalPathFlag), ENOENT);
    EXPECT_EQ(file(std::string_view("/x\0y", 4), 0), ENOENT);
    EXPECT_EQ(file(folder.write("f", "") + "/below", Sandbox::canonicalPathFlag), ENOTDIR);
    EXPECT_EQ(sandbox.issueServiceExtension("a", "", 0).error(), EINVAL);
    EXPECT_EQ(sandbox.issueServiceExtension("a", std::string_view("a\0", 2), 0).error(), EINVAL);
}

TEST(HmacSandbox, TellsWhoIsMoreConfined) {
    HmacSandbox sandbox;
    ipc::Peer self = peerOfProcess(::getpid());
    EXPECT_FALSE(sandbox.isSandboxed(self));
    EXPECT_TRUE(sandbox.isSandboxed(ipc::Peer{}));
    self.process.reset();
    EXPECT_TRUE(sandbox.isSandboxed(self)) << "the pid may be another's";
    self = peerOfProcess(::getpid());
    self.executable.reset();
    EXPECT_TRUE(sandbox.isSandboxed(self)) << "nobody knows what it is";
}

TEST(Confinement, ComparesFiltersAndNamespaces) {
    const Confinement self{1, "user:[1]", "mnt:[1]"};
    const Confinement first{0, "user:[1]", "mnt:[9]"};

    const std::tuple<Confinement, bool, bool> cases[] = {
        {{1, "user:[1]", "mnt:[1]"}, false, false}, {{0, "user:[1]", "mnt:[1]"}, false, false},
        {{2, "user:[1]", "mnt:[1]"}, true, true},   {{1, "user:[2]", "mnt:[1]"}, true, true},
        {{1, "user:[1]", "mnt:[9]"}, false, true},  {{1, "user:[1]", "mnt:[2]"}, true, true},
    };

    for (const auto& [process, confined, confinedWithoutFirst] : cases) {
        EXPECT_EQ(isMoreConfined(process, self, first), confined);
        EXPECT_EQ(isMoreConfined(process, self, std::nullopt), confinedWithoutFirst);
    }
}

TEST(Confinement, CountsTheFiltersOfAStatus) {
    EXPECT_EQ(seccompFiltersIn("Name:\tx\nSeccomp:\t2\nSeccomp_filters:\t12\nx:\t1\n"), 12U);
    EXPECT_EQ(seccompFiltersIn("Name:\tx\nSeccomp:\t2\n"), 1U);
    EXPECT_EQ(seccompFiltersIn("Name:\tx\nSeccomp:\t0\n"), 0U);
    EXPECT_EQ(seccompFiltersIn("Name:\tSeccomp_filters:\t5\n"), 0U);
    EXPECT_EQ(seccompFiltersIn(""), 0U);
}
