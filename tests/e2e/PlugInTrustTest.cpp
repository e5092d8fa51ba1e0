#include <filesystem>
#include <thread>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

// Plug-ins that the keys of a test make what they are. Somebody elected "old".
class PlugInTrust : public testing::Test {
protected:
    PlugInTrust() {
        signer.sign(elected, Item::map({{"com.tovana.developer.auto-elect-plugin", true},
                                        {"com.example.may", true}}));
        signer.sign(replacing, Item::map({{"com.tovana.developer.replace-plugin", "old"},
                                          {"com.example.may", "x"}}));
        fs::copy_file(elected + "/Signature", forged + "/Signature");
        writeFile(
            home / "annotations",
            xmlPlist(Item::map(
                {{"version", 16}, {"data", Item::map({{"old", Item::map({{"election", 1}})}})}})));
    }

    [[nodiscard]] std::string add(const std::string& identifier) const {
        return addPlugIn(app, identifier, {.identifier = identifier});
    }

    // Who is elected, who has an entitlement, who is replaced.
    [[nodiscard]] static std::string seen(WireClient& client) {
        std::string replaced;
        for (const Item& form : match(client, Item::map({}))) {
            if (form.has("overrider"))
                replaced += form["identifier"].text();
        }
        return matched(client, Item::map({{"HXUserElection", "1"}})) + ", " +
               matched(client, Item::map({{"ENTITLEMENT:com.example.may", true}})) + ", " +
               replaced;
    }

    // The same as soon as it is what was expected.
    [[nodiscard]] static std::string becomes(WireClient& client, const std::string& expected) {
        std::string now = seen(client);
        for (int i = 0; i < 200 && now != expected; ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(25));
            now = seen(client);
        }
        return now;
    }

    [[nodiscard]] std::size_t complaints(const Daemon& daemon, const std::string& plugIn) const {
        return daemon.linesWith("the signature of " + plugIn + " does not count: ");
    }

    const Home home;
    const std::string app = home.addApp("Some");
    const std::string elected = add("elected");
    const std::string forged = add("forged");
    const std::string old = add("old");
    const std::string replacing = add("replacing");
    const Signer signer{home};
    const std::string key = signer.trustedKey();
    const std::string away = home / "key.away";
};

constexpr const char* nothing = "old, , ";
constexpr const char* everything = "elected old replacing, elected replacing, old";
// An election that was made is kept.
constexpr const char* afterwards = "elected old, , ";

TEST_F(PlugInTrust, FollowsTheKeysWhileTheDaemonRuns) {
    fs::remove_all(home / "etc");
    Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(seen(client), nothing);

    const Item before = findAt(client, replacing);
    fs::create_directories(fs::path(key).parent_path());
    fs::copy_file(home / "keys-key/zephrin.pub.pem", key);
    EXPECT_EQ(becomes(client, everything), everything);
    EXPECT_EQ(findAt(client, replacing)["uuid"], before["uuid"]);
    EXPECT_EQ(findAt(client, replacing)["annotations"], Item::map({{"election", 1}}));

    fs::rename(key, away);
    EXPECT_EQ(becomes(client, afterwards), afterwards);
    fs::rename(away, key);
    EXPECT_EQ(becomes(client, everything), everything);
    fs::permissions(fs::path(key).parent_path(), fs::perms(0777));
    EXPECT_EQ(becomes(client, afterwards), afterwards) << "others may add keys";

    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_GE(daemon.linesWith("ops default: trust change detected; purging cache"), 4u);
    EXPECT_EQ(complaints(daemon, forged), 2u) << "untrusted, and made for another bundle";
    EXPECT_EQ(complaints(daemon, elected), 1u) << "untrusted";
    EXPECT_EQ(complaints(daemon, replacing), 1u) << "untrusted";
    EXPECT_EQ(complaints(daemon, old), 0u);
}

TEST_F(PlugInTrust, OutlivesTheDaemonButNoChangeOfAByte) {
    const auto flip = [](const std::string& file, std::size_t at) {
        std::string content = readFile(file);
        content.at(at) ^= 1;
        writeFile(file, content);
    };

    const struct {
        const char* what;
        std::function<void()> change;
        const char* seen;
    } steps[] = {
        {"as it was signed", [] {}, everything},
        {"without a change", [] {}, everything},
        {"without a key", [&] { fs::rename(key, away); }, afterwards},
        {"with the key", [&] { fs::rename(away, key); }, everything},
        {"another executable",
         [&] { flip(replacing + "/plugin", readFile(replacing + "/plugin").size() - 2); },
         "elected old, elected, "},
        {"another Info.plist",
         [&] {
             const std::string file = elected + "/Info.plist";
             flip(file, readFile(file).find("com.tovana.widget") + 16);
         },
         afterwards},
        {"another signature",
         [&] {
             signer.sign(elected, Item::map({{"com.example.may", true}}));
             const std::string file = elected + "/Signature";
             flip(file, readFile(file).find("statement") + 60);
         },
         afterwards},
    };

    for (const auto& step : steps) {
        SCOPED_TRACE(step.what);
        step.change();
        writeFile(home / "zpd.log", "");
        Daemon daemon(home.path());
        {
            WireClient client = daemon.connect();
            EXPECT_EQ(seen(client), step.seen);
        }
        EXPECT_EQ(daemon.terminate(), 0);
        EXPECT_EQ(complaints(daemon, forged), 1u);
        EXPECT_EQ(complaints(daemon, elected), step.seen == std::string(afterwards) ? 1u : 0u);
    }
}

} // namespace
} // namespace e2e
