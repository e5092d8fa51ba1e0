#include "platform/paths/Places.h"

#include <cstdlib>
#include <filesystem>
#include <string>
#include <unistd.h>
#include <utility>

#include <gmock/gmock.h>

#include "tests/platform/TestFolder.h"

using namespace platform;
using testing::ElementsAre;

TEST(Places, LieBelowTheHomeThatIsNamed) {
    const TestFolder folder;
    std::filesystem::create_directory_symlink(".", folder / "link");
    ::setenv("ZEPHRIN_HOME", (folder / "link/home/").c_str(), 1);
    const std::string home = folder / "home";
    const Places places = Places::forThisProcess();
    ::unsetenv("ZEPHRIN_HOME");
    EXPECT_EQ(places.socketPath("com.tovana.x"), home + "/run/com.tovana.x");
    EXPECT_THAT(
        places.applicationFolders,
        ElementsAre(home + "/Applications", home + "/System/Applications", "/System/Applications"));
}

TEST(Places, FollowTheUserWithoutAHome) {
    ::setenv("HOME", "/users/a", 1);
    const std::pair<const char*, std::string> cases[] = {
        {"/data", "/data/zephrin/run"}, {"relative", "/users/a/.local/share/zephrin/run"}};
    for (const auto& [data, run] : cases) {
        ::setenv("XDG_DATA_HOME", data, 1);
        EXPECT_EQ(Places::forThisProcess().run, ::geteuid() == 0 ? "/run/zephrin" : run);
    }
    ::unsetenv("XDG_DATA_HOME");
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
