#include <gtest/gtest.h>

#include "Zephrin/ZPBundle.h"
#include "platform/plist/PropertyList.h"
#include "tests/platform/TestFolder.h"

using namespace platform;

namespace {

// X.app with an executable, and with a plug-in that has none.
struct BundleTest : testing::Test {
    TestFolder folder;
    std::string app = folder / "X.app";
    std::string executable = folder.write("X.app/x", "x");

    BundleTest() {
        writeInfo("X.app", {{"BQBundleIdentifier", "com.example.x"}, {"BQBundleExecutable", "x"}});
        writeInfo("X.app/PlugIns/Y.appex", {{"BQBundleIdentifier", 7}});
        std::filesystem::permissions(executable, std::filesystem::perms::owner_all);
    }

    void writeInfo(const std::string& bundle, Dictionary info) {
        folder.write(bundle + "/Info.plist", platform::plist::writeXml(info).value());
    }
};

} // namespace

TEST_F(BundleTest, IsFoundByItsFolderAndByItsExecutable) {
    for (const auto& bundle :
         {ZPBundle::atPath(app), ZPBundle::atURL("file://" + app + "/"),
          ZPBundle::forExecutablePath(executable),
          ZPBundle::forExecutableURL("file://" + executable), ZPBundle::forExecutablePath(app)}) {
        EXPECT_EQ(bundle.path(), app);
        EXPECT_EQ(bundle.url(), "file://" + app);
        EXPECT_EQ(bundle.executablePath(), executable);
        EXPECT_EQ(bundle.bundleIdentifier(), "com.example.x");
        EXPECT_EQ(bundle.plugInsPath(), app + "/PlugIns");
        EXPECT_EQ(bundle.bundleDirectory("Shared"), app + "/Shared");
        ASSERT_TRUE(bundle.infoDictionary());
        EXPECT_EQ(bundle.infoDictionary()->size(), 2U);
    }
}

TEST_F(BundleTest, WithoutExecutableHasItsOwnPathForIt) {
    const auto bundle = ZPBundle::atPath(app + "/PlugIns/Y.appex");
    EXPECT_EQ(bundle.executablePath(), app + "/PlugIns/Y.appex");
    EXPECT_EQ(bundle.bundleIdentifier(), std::nullopt);
}

TEST_F(BundleTest, WhoseInfoIsNoDictionaryHasAPathAndNoInfo) {
    folder.write("List.app/Info.plist", *platform::plist::writeXml(Array{1}));
    const auto bundle = ZPBundle::atPath(folder / "List.app");
    EXPECT_EQ(bundle.path(), folder / "List.app");
    EXPECT_EQ(bundle.infoDictionary(), std::nullopt);
    EXPECT_EQ(bundle.bundleIdentifier(), std::nullopt);
}

TEST_F(BundleTest, AnswersNothingWhereThereIsNone) {
    for (const auto& bundle : {ZPBundle::atPath(folder.path()), ZPBundle::atPath("/nowhere"),
                               ZPBundle::atURL("http://x"), ZPBundle::forExecutablePath("/nowhere"),
                               ZPBundle::forMainBundle()}) {
        EXPECT_EQ(bundle.path(), std::nullopt);
        EXPECT_EQ(bundle.executablePath(), std::nullopt);
        EXPECT_EQ(bundle.infoDictionary(), std::nullopt);
        EXPECT_EQ(bundle.bundleIdentifier(), std::nullopt);
        EXPECT_EQ(bundle.plugInsPath(), std::nullopt);
    }
}
