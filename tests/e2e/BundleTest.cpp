#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

struct Case {
    const char* what;
    void (*spoil)(const std::string& bundle); // a plug-in that was good until then
};

void replaceInfo(const std::string& bundle, const std::string& content) {
    writeFile(bundle + "/Info.plist", content);
}

void replaceIdentifier(const std::string& bundle, const std::string& identifier) {
    replaceInfo(bundle, xmlPlist(PlugIn{.identifier = identifier}.infoDictionary()));
}

void makeFifo(const std::string& path) {
    fs::remove(path);
    ASSERT_EQ(mkfifo(path.c_str(), 0644), 0);
}

void makeSparse(const std::string& path, off_t size) {
    const int fd = open(path.c_str(), O_WRONLY | O_CREAT, 0755);
    ASSERT_EQ(ftruncate(fd, size), 0);
    close(fd);
}

std::string withEntities(const std::string& declarations, const std::string& used) {
    return "<?xml version=\"1.0\"?>\n<!DOCTYPE plist [" + declarations + "]>\n<plist><dict>" +
           "<key>BQBundleIdentifier</key><string>" + used + "</string></dict></plist>\n";
}

std::string laughs() {
    std::string declarations = "<!ENTITY e0 \"ha\">";
    for (int i = 1; i < 20; ++i) {
        const std::string before = "&e" + std::to_string(i - 1) + ";";
        declarations += "<!ENTITY e" + std::to_string(i) + " \"";
        for (int k = 0; k < 10; ++k)
            declarations += before;
        declarations += "\">";
    }
    return withEntities(declarations, "&e19;");
}

std::string deepInfo(int levels) {
    std::string arrays;
    for (int i = 0; i < levels; ++i)
        arrays = "<array>" + arrays + "</array>";
    std::string info = xmlPlist(PlugIn{.info = Item::map({{"Deep", true}})}.infoDictionary());
    return info.replace(info.find("<true/>"), std::string_view("<true/>").size(), arrays);
}

const std::vector<Case> spoilings = {
    {"empty Info.plist", [](const std::string& b) { replaceInfo(b, ""); }},
    {"no property list", [](const std::string& b) { replaceInfo(b, std::string(999, '\xfe')); }},
    {"XML cut short",
     [](const std::string& b) { replaceInfo(b, readFile(b + "/Info.plist").substr(0, 200)); }},
    {"binary cut short",
     [](const std::string& b) {
         replaceInfo(b, binaryPlist(PlugIn{}.infoDictionary()).substr(0, 90));
     }},
    {"binary that refers to itself",
     [](const std::string& b) {
         replaceInfo(b, std::string("bplist00\xa1\0\x08", 11) + std::string(6, '\0') + "\1\1" +
                            std::string("\0\0\0\0\0\0\0\1\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x0a", 24));
     }},
    {"an array", [](const std::string& b) { replaceInfo(b, xmlPlist(Item::array({}))); }},
    {"over 1 MiB",
     [](const std::string& b) {
         const Item filling = Item::map({{"Filling", std::string((1 << 20) + 1, 'x')}});
         replaceInfo(b, xmlPlist(PlugIn{.info = filling}.infoDictionary()));
     }},
    {"1 TB of nothing",
     [](const std::string& b) { makeSparse(b + "/Info.plist", off_t{1} << 40); }},
    {"nested too deep", [](const std::string& b) { replaceInfo(b, deepInfo(40)); }},
    {"nested far too deep", [](const std::string& b) { replaceInfo(b, deepInfo(10000)); }},
    {"entities within entities", [](const std::string& b) { replaceInfo(b, laughs()); }},
    {"an outer entity",
     [](const std::string& b) {
         replaceInfo(b, withEntities("<!ENTITY f SYSTEM \"file:///etc/hostname\">", "&f;"));
     }},
    {"an innocent entity",
     [](const std::string& b) { replaceInfo(b, withEntities("<!ENTITY i \"com.i\">", "&i;")); }},
    {"Info.plist as FIFO", [](const std::string& b) { makeFifo(b + "/Info.plist"); }},
    {"Info.plist as folder",
     [](const std::string& b) {
         fs::remove(b + "/Info.plist");
         fs::create_directory(b + "/Info.plist");
     }},
    {"executable as FIFO", [](const std::string& b) { makeFifo(b + "/plugin"); }},
    {"slash in the identifier", [](const std::string& b) { replaceIdentifier(b, "../../x"); }},
    {"two dots", [](const std::string& b) { replaceIdentifier(b, ".."); }},
    {"one dot", [](const std::string& b) { replaceIdentifier(b, "."); }},
    {"empty identifier", [](const std::string& b) { replaceIdentifier(b, ""); }},
    {"long identifier", [](const std::string& b) { replaceIdentifier(b, std::string(256, 'i')); }},
    {"control character", [](const std::string& b) { replaceIdentifier(b, "com.\n.x"); }},
    {"a bundle that others can write", [](const std::string& b) { chmod(b.c_str(), 0777); }},
    {"an Info.plist that others can write",
     [](const std::string& b) { chmod((b + "/Info.plist").c_str(), 0666); }},
    {"a PlugIns folder that others can write",
     [](const std::string& b) { chmod(fs::path(b).parent_path().c_str(), 0777); }},
    {"an executable that others can write",
     [](const std::string& b) { chmod((b + "/plugin").c_str(), 0777); }}};

TEST(Bundles, ThatAreBrokenAreSkippedAndSaidOnce) {
    const Home home;
    std::vector<std::string> spoilt;
    for (std::size_t i = 0; i < spoilings.size(); ++i) {
        spoilt.push_back(addAppWith(home, "Bad" + std::to_string(i), {.identifier = "bad"}));
        spoilings[i].spoil(spoilt.back());
    }
    const std::string good = addAppWith(home, "Good", {.identifier = "good"});
    const auto before = std::chrono::steady_clock::now();
    Daemon daemon(home.path(), {.logLevel = "default"});
    EXPECT_LT(std::chrono::steady_clock::now() - before, 20s);
    {
        WireClient client = daemon.connect();
        EXPECT_EQ(matched(client, Item::map({})), "good");
        EXPECT_EQ(findAt(client, good)["identifier"], Item("good"));
    }
    EXPECT_EQ(daemon.terminate(), 0);
    for (std::size_t i = 0; i < spoilings.size(); ++i) {
        const std::string app = fs::path(spoilt[i]).parent_path().parent_path().string();
        EXPECT_EQ(daemon.linesWith(app + "/"), 1u) << spoilings[i].what;
    }
}

TEST(Bundles, AtTheLimitsAreServed) {
    const Home home;
    const std::string app = home.addApp("Some");
    const auto add = [&](const std::string& identifier, const Item& info = Item::map({})) {
        return addPlugIn(app, "p" + identifier.substr(0, 20),
                         {.identifier = identifier, .info = info});
    };
    add(std::string(255, 'i'));
    add("large", Item::map({{"Filling", std::string((1 << 20) - 2000, 'x')}}));
    add("a.b-c_d e:ä%&");
    makeSparse(add("sparse") + "/plugin", off_t{1} << 40);
    fs::remove(add("without-executable-file") + "/plugin");
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({{"HXExtensionIdentifier", std::string(255, 'i')}})),
              std::string(255, 'i'));
    EXPECT_EQ(matched(client, Item::map({{"HXExtensionIdentifier", "large"}})), "large");
    EXPECT_EQ(matched(client, Item::map({{"HXExtensionIdentifier", "a.b-c_d e:ä%&"}})),
              "a.b-c_d e:ä%&");
    EXPECT_EQ(matched(client, Item::map({{"HXExtensionIdentifier", "sparse"}})), "sparse");
}

TEST(Bundles, AreRegisteredOnceHoweverTheyAreReached) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {.identifier = "some"});
    fs::create_symlink(home / "Applications/Some.app", home / "Applications/Again.app");
    fs::create_symlink(path, home / "Applications/Some.app/PlugIns/Again.appex");
    fs::create_symlink(home / "nowhere", home / "Applications/Dangling.app");
    fs::create_symlink(home / "Applications/Loop.app", home / "Applications/Loop.app");
    addAppWith(home, ".Hidden", {.identifier = "hidden"});
    addPlugIn(home / "Applications/Some.app", ".hidden", {.identifier = "hidden"});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const std::vector<Item> forms = match(client, Item::map({}), 5);
    ASSERT_EQ(forms.size(), 1u);
    EXPECT_EQ(forms[0]["path"], Item(path));
}

// Between the registry's pass and a request a bundle may go away.
TEST(Bundles, ThatVanishHarmNobody) {
    const Home home;
    const std::string gone = addAppWith(home, "Gone", {.identifier = "gone"});
    addAppWith(home, "Good", {.identifier = "good"});
    Daemon daemon(home.path());
    WireClient client = daemon.connect();
    fs::remove_all(home / "Applications/Gone.app");
    const std::string left = matched(client, Item::map({}));
    EXPECT_TRUE(left == "good" || left == "gone good") << left;
    client.request(findRequest(Item::map({{"paths", "file://" + gone}})));
    EXPECT_TRUE(matched(client, Item::map({})).ends_with("good"));
    EXPECT_EQ(daemon.terminate(), 0);
}

} // namespace
} // namespace e2e
