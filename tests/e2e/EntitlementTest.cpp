// Whose entitlements count: what a signed program may do, and what takes it away.

#include <functional>
#include <unistd.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr uid_t stranger = 4711;

void changeByte(const std::string& path, std::size_t fromEnd) {
    std::string content = readFile(path);
    content[content.size() - fromEnd] ^= 1;
    const auto mode = static_cast<unsigned>(fs::status(path).permissions());
    fs::remove(path);
    writeFile(path, content, mode);
}

void giveAway(const std::string& path) {
    ASSERT_EQ(chown(path.c_str(), stranger, stranger), 0);
}

// Beside the lone program that is signed an application, both of them probes.
class Entitlements : public ManagerTest {
protected:
    Entitlements() {
        addProgram(app + "/Manager");
        key.sign(app);
        start();
    }

    struct Spoiling {
        const char* what;
        std::string program;
        std::function<void()> spoil;
    };

    // Each program is what it should be until it is spoilt.
    void expectLost(const std::vector<Spoiling>& cases) const {
        for (const auto& [what, program, spoil] : cases) {
            SCOPED_TRACE(what);
            ASSERT_EQ(answerTo(program), granted);
            spoil();
            EXPECT_EQ(answerTo(program), refused);
        }
    }

    const std::string app = home.addApp("Manager");
    const std::string executable = app + "/Manager";
    const std::string& lone = manager;
};

TEST_F(Entitlements, CountForSignedPrograms) {
    EXPECT_EQ(answerTo(lone), granted);
    EXPECT_EQ(answerTo(executable), granted);
    Words managed = command(lone, {"hello", "ask"});
    managed.insert(managed.begin(), {"/bin/sh", "-c", R"(exec "$0" "$@")"});
    EXPECT_EQ(Talk(home, managed).hear(), granted) << "becomes the program before it connects";
    Talk rude(home, command(lone, {"connect", "listen", "ask", "names"}));
    EXPECT_EQ(rude.rest(), (Words{refused, "plug-ins: "})) << "no greeting";
}

TEST_F(Entitlements, CountAgainAfterTheDaemonsRestart) {
    const std::string library = addProgram(home / "tools/library", "e2e_library_probe");
    key.sign(library);
    Talk independent(home, {lone, daemon->socketPath()});
    Talk withLibrary(home, {library, "e2e"});
    independent.tell("hello");
    EXPECT_EQ(independent.ask(), granted);
    EXPECT_EQ(withLibrary.ask(), granted);
    restart();
    independent.tell("hello");
    EXPECT_EQ(independent.ask(), granted);
    EXPECT_EQ(withLibrary.ask(), granted);
}

TEST_F(Entitlements, DoNotCountForWhatIsNotAsItWasSigned) {
    const Signer untrusted(home, "other", false);
    const std::string open = addProgram(home / "open/probe");
    key.sign(open);
    EXPECT_EQ(answerTo(addProgram(home / "tools/unsigned")), refused);
    expectLost({{"in a folder that others can write", open,
                 [&] { fs::permissions(home / "open", fs::perms(0777)); }},
                {"one byte of Info.plist", executable, [&] { changeByte(app + "/Info.plist", 1); }},
                {"one byte of a lone executable", lone, [&] { changeByte(lone, 1); }}});
    key.sign(lone);
    expectLost(
        {{"one byte of its signature", lone, [&] { changeByte(lone + ".signature", 200); }}});
    key.sign(lone);
    expectLost({{"signed with a key that is not trusted", lone, [&] { untrusted.sign(lone); }}});
}

TEST_F(Entitlements, AreLostWhileTheProgramRuns) {
    const auto replace = [](const std::string& path) {
        addProgram(path + ".new");
        fs::rename(path + ".new", path);
    };
    const std::vector<Spoiling> cases = {
        {"its executable is replaced", lone, [&] { replace(lone); }},
        {"its signature is changed", lone, [&] { changeByte(lone + ".signature", 200); }},
        {"its Info.plist is changed", executable, [&] { changeByte(app + "/Info.plist", 1); }},
        {"its key is removed", lone, [&] { fs::remove(key.trustedKey()); }}};
    for (const Spoiling& each : cases) {
        SCOPED_TRACE(each.what);
        key.sign(lone);
        Talk talk(home, {each.program, daemon->socketPath()});
        talk.tell("hello");
        ASSERT_EQ(talk.ask(), granted);
        each.spoil();
        EXPECT_EQ(talk.ask(), refused);
        EXPECT_TRUE(talk.ask("names").starts_with("plug-ins:")) << "served all the same";
    }
}

TEST_F(Entitlements, RestOnFilesThatNobodyElseOwns) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can give files away";
    const std::string folder = home / "other/folder";
    const std::string below = addProgram(folder + "/probe");
    key.sign(below);
    expectLost({{"the bundle", executable, [&] { giveAway(app); }},
                {"a folder above the program", below, [&] { giveAway(home / "other"); }},
                {"the signature", lone, [&] { giveAway(lone + ".signature"); }}});
    key.sign(lone);
    ASSERT_EQ(chown((lone + ".signature").c_str(), 0, 0), 0);
    expectLost({{"the trust folder", lone, [&] { giveAway(home / "etc/trust.d"); }}});
}

TEST_F(Entitlements, DecideWhatAHostIsOffered) {
    home.addAppWithPlugIns("Some", {"free", "other"});
    addAppWith(home, "Asking",
               {.identifier = "asking",
                .extension = Item::map({{"HXExtensionHostEntitlement", "com.example.host"}})});
    restart();
    const auto offered = [&](const Item& entitlements) {
        key.sign(lone, entitlements);
        return answerTo(lone, {"hello", "names"});
    };
    const char* const allowed = "com.tovana.developer.zephrin.allowedplugins";
    const Item justFree = Item::map({{"BQBundleIdentifier", "free"}});
    const Item notOther = Item::map({{"BQBundleIdentifier", Item::array({"free", "asking"})}});
    EXPECT_EQ(offered(Item::map({{"x", true}})), "plug-ins: free other");
    EXPECT_EQ(offered(Item::map({{"com.example.host", true}})), "plug-ins: asking free other");
    EXPECT_EQ(offered(Item::map({{"com.example.host", false}})), "plug-ins: free other");
    EXPECT_EQ(offered(Item::map({{allowed, justFree}})), "plug-ins: free");
    EXPECT_EQ(offered(Item::map({{allowed, notOther}, {"com.example.host", "yes"}})),
              "plug-ins: asking free");
    EXPECT_EQ(offered(Item::map({{allowed, "free"}, {"com.example.host", true}})), "plug-ins: ");
    EXPECT_TRUE(daemon->logs("invalid host restriction entitlement"));
}

} // namespace
} // namespace e2e
