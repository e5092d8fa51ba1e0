#include <filesystem>
#include <sys/stat.h>

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

// A few of each sort; the registry's own tests have them all.
const std::vector<Case> spoilings = {
    {"no property list", [](const std::string& b) { replaceInfo(b, std::string(999, '\xfe')); }},
    {"XML cut short",
     [](const std::string& b) { replaceInfo(b, readFile(b + "/Info.plist").substr(0, 200)); }},
    {"binary that refers to itself",
     [](const std::string& b) {
         replaceInfo(b, std::string("bplist00\xa1\0\x08", 11) + std::string(6, '\0') + "\1\1" +
                            std::string("\0\0\0\0\0\0\0\1\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x0a", 24));
     }},
    {"1 TB of nothing",
     [](const std::string& b) { fs::resize_file(b + "/Info.plist", std::uintmax_t{1} << 40); }},
    {"Info.plist as FIFO", [](const std::string& b) { makeFifo(b + "/Info.plist"); }},
    {"executable as FIFO", [](const std::string& b) { makeFifo(b + "/plugin"); }},
    {"slash in the identifier", [](const std::string& b) { replaceIdentifier(b, "../../x"); }},
    {"long identifier", [](const std::string& b) { replaceIdentifier(b, std::string(256, 'i')); }},
    {"an Info.plist that others can write",
     [](const std::string& b) { chmod((b + "/Info.plist").c_str(), 0666); }},
    {"a PlugIns folder that others can write",
     [](const std::string& b) { chmod(fs::path(b).parent_path().c_str(), 0777); }}};

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

} // namespace
} // namespace e2e
