#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

// Plug-ins that the keys of a test make what they are. Somebody elected "old".
class PlugInTrust : public DaemonTest {
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
    [[nodiscard]] std::string state() {
        std::string replaced;
        for (const Item& form : match(*client)) {
            if (form.has("overrider"))
                replaced += form["identifier"].text();
        }
        return seen(Item::map({{"HXUserElection", "1"}})) + ", " +
               seen(Item::map({{"ENTITLEMENT:com.example.may", true}})) + ", " + replaced;
    }

    void expectSoon(const std::string& expected) {
        EXPECT_TRUE(eventually([&] { return state() == expected; })) << state();
    }

    void expectComplaints(const std::string& plugIn, std::size_t count) const {
        expectLog({{"the signature of " + plugIn + " does not count: ", count}});
    }

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
    start();
    EXPECT_EQ(state(), nothing);

    const Item before = findAt(*client, replacing);
    fs::create_directories(fs::path(key).parent_path());
    fs::copy_file(home / "keys-key/zephrin.pub.pem", key);
    expectSoon(everything);
    EXPECT_EQ(findAt(*client, replacing)["uuid"], before["uuid"]);
    EXPECT_EQ(findAt(*client, replacing)["annotations"], Item::map({{"election", 1}}));

    fs::rename(key, away);
    expectSoon(afterwards);
    fs::rename(away, key);
    expectSoon(everything);
    fs::permissions(fs::path(key).parent_path(), fs::perms(0777)); // others may add keys
    expectSoon(afterwards);

    stop();
    EXPECT_GE(daemon->linesWith("ops default: trust change detected; purging cache"), 4u);
    expectComplaints(forged, 2); // untrusted, and made for another bundle
    expectComplaints(elected, 1);
    expectComplaints(replacing, 1);
    expectComplaints(old, 0);
}

TEST_F(PlugInTrust, OutlivesTheDaemonButNoChangeOfAByte) {
    const auto flip = [](const std::string& file, std::size_t at) {
        std::string content = readFile(file);
        content.at(at) ^= 1;
        writeFile(file, content);
    };

    const std::tuple<const char*, std::function<void()>, std::string> steps[] = {
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

    for (const auto& [what, change, expected] : steps) {
        SCOPED_TRACE(what);
        change();
        writeFile(home / "zpd.log", "");
        start();
        EXPECT_EQ(state(), expected);
        client.reset();
        stop();
        expectComplaints(forged, 1);
        expectComplaints(elected, expected == afterwards ? 1 : 0);
    }
}

} // namespace
} // namespace e2e
