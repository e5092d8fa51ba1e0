#include "platform/paths/Places.h"

#include <cstdlib>
#include <filesystem>
#include <map>
#include <string>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/platform/TestFolder.h"

using namespace platform;
using testing::ElementsAre;

namespace {

// Sets variables ("" unsets), and puts them back.
class Environment {
public:
    explicit Environment(const std::map<std::string, std::string>& variables) {
        for (const auto& [name, value] : variables) {
            const char* old = std::getenv(name.c_str());
            before_[name] = old ? old : "";
            set(name, value);
        }
    }

    ~Environment() {
        for (const auto& [name, value] : before_)
            set(name, value);
    }

private:
    static void set(const std::string& name, const std::string& value) {
        if (value.empty()) {
            ::unsetenv(name.c_str());
        } else {
            ::setenv(name.c_str(), value.c_str(), 1);
        }
    }

    std::map<std::string, std::string> before_;
};

} // namespace

TEST(Places, LieBelowTheHomeThatIsNamed) {
    const TestFolder folder;
    std::filesystem::create_directory_symlink(".", folder / "link");
    const Environment environment({{"ZEPHRIN_HOME", folder / "link/home/"}});
    const std::string home = folder / "home";
    const Places places = Places::forThisProcess();
    EXPECT_EQ(places.socketPath("com.tovana.x"), home + "/run/com.tovana.x");
    EXPECT_EQ(places.notify, home + "/run/notify");
    EXPECT_EQ(places.registryDatabase, home + "/lib/AppRegistry.db");
    EXPECT_EQ(places.preferences, home + "/etc/Preferences");
    EXPECT_EQ(places.locale, home + "/etc/locale.conf");
    EXPECT_THAT(
        places.applicationFolders,
        ElementsAre(home + "/Applications", home + "/System/Applications", "/System/Applications"));
    EXPECT_THAT(places.plugInFolders, ElementsAre("/System/Library/PlugIns"));
    EXPECT_THAT(places.extensionPointFolders, ElementsAre(home + "/System/Library/ExtensionPoints",
                                                          "/System/Library/ExtensionPoints"));
}

TEST(Places, FollowTheUserWithoutAHome) {
    const struct {
        const char* data;
        const char* home;
        const char* run;
    } cases[] = {
        {"/data", "/users/a", "/data/zephrin/run"},
        {"relative", "/users/a", "/users/a/.local/share/zephrin/run"},
        {"", "/users/a", "/users/a/.local/share/zephrin/run"},
    };

    for (const auto& c : cases) {
        const Environment environment(
            {{"ZEPHRIN_HOME", ""}, {"XDG_DATA_HOME", c.data}, {"HOME", c.home}});
        const std::string expected = ::geteuid() == 0 ? "/run/zephrin" : c.run;
        EXPECT_EQ(Places::forThisProcess().run, expected);
    }
}

TEST(Places, TellTheSystemVolume) {
    const TestFolder folder;
    std::filesystem::create_directories(folder / "elsewhere");
    std::filesystem::create_directory_symlink(folder / "elsewhere", folder / "System");
    const Places places = Places::forHome(folder.path());
    EXPECT_TRUE(places.onSystemVolume("/System/Applications/A.app"));
    EXPECT_TRUE(places.onSystemVolume(folder / "System/A.app"));
    EXPECT_TRUE(places.onSystemVolume(folder / "elsewhere/A.app"));
    for (const std::string& path :
         {std::string("/Systems/A.app"), std::string("/System"), folder / "Applications/A.app"})
        EXPECT_FALSE(places.onSystemVolume(path)) << path;
    EXPECT_FALSE(Places::forSystem().onSystemVolume(folder / "System/A.app"));
}
