#include "platform/bundle/Bundle.h"

#include <filesystem>
#include <sys/stat.h>

#include <gtest/gtest.h>

#include "platform/plist/PropertyList.h"
#include "tests/platform/TestFolder.h"

namespace fs = std::filesystem;
using namespace platform;
using Property = BundleReader::Property;

namespace {

std::string infoNaming(const Value& executable) {
    return *plist::writeXml(Dictionary{{"BQBundleExecutable", executable}, {"Key", 1}});
}

} // namespace

TEST(BundleReader, TakesOnlyARegularFileInItsFolderForItsExecutable) {
    const TestFolder folder;
    fs::create_directories(folder / "A.app/Folder");
    folder.write("A.app/Folder/Inner", "");
    folder.write("outside", "");
    ASSERT_EQ(::mkfifo((folder / "A.app/Pipe").c_str(), 0600), 0);
    const Value names[] = {"Missing", "Folder", "Pipe", "Folder/Inner", "../outside",
                           "",        "..",     1,      Array{"Main"}};
    for (const Value& name : names) {
        folder.write("A.app/Info.plist", infoNaming(name));
        const auto bundle = BundleReader::atPath(folder / "A.app");
        EXPECT_TRUE(bundle.stringProperty(Property::bundlePath)) << describe(name);
        EXPECT_FALSE(bundle.stringProperty(Property::executablePath)) << describe(name);
    }
}

TEST(BundleReader, IsInvalidWithoutAnInfoThatCanBeRead) {
    const TestFolder folder;
    folder.write("Broken/Info.plist", "<plist><dict>");
    folder.write("Big/Info.plist", infoNaming("x") + std::string(BundleReader::largestInfo, ' '));
    fs::create_directories(folder / "Empty");
    fs::create_directories(folder / "Pipe");
    ASSERT_EQ(::mkfifo((folder / "Pipe/Info.plist").c_str(), 0600), 0);
    folder.write("File", "");
    for (const char* name : {"Broken", "Big", "Empty", "Pipe", "File", "Missing"}) {
        const auto bundle = BundleReader::atPath(folder / name);
        EXPECT_FALSE(bundle.stringProperty(Property::bundlePath)) << name;
        EXPECT_FALSE(bundle.stringProperty(Property::executablePath)) << name;
        EXPECT_FALSE(bundle.infoDictionary()) << name;
        EXPECT_FALSE(BundleReader::read(folder / name)) << name;
    }
    EXPECT_EQ(BundleReader::read(folder / "Empty").error().code, fileErrorNoSuchFile);
    EXPECT_EQ(BundleReader::read(folder / "Big").error().code, fileErrorTooLarge);
}

TEST(BundleReader, FindsTheBundleThatNamesAnExecutable) {
    const TestFolder folder;
    folder.write("A.app/Info.plist", infoNaming("Main"));
    folder.write("A.app/Main", "");
    folder.write("A.app/helper", "");
    folder.write("A.app/PlugIns/B.appex/Info.plist", infoNaming("B"));
    folder.write("A.app/PlugIns/B.appex/B", "");
    folder.write("A.app/PlugIns/C.appex/Info.plist", infoNaming("Linked"));
    folder.write("A.app/PlugIns/C.appex/bin/real", "");
    fs::create_symlink("bin/real", folder / "A.app/PlugIns/C.appex/Linked");

    const std::pair<const char*, std::optional<std::string>> cases[] = {
        {"A.app/Main", folder / "A.app"},
        {"A.app/helper", std::nullopt},
        {"A.app/PlugIns/B.appex/B", folder / "A.app/PlugIns/B.appex"},
        {"A.app/PlugIns/C.appex/bin/real", folder / "A.app/PlugIns/C.appex"},
        {"A.app/missing", std::nullopt},
        {"A.app", std::nullopt},
    };

    for (const auto& [executable, bundle] : cases) {
        const auto found = BundleReader::forExecutable(folder / executable);
        EXPECT_EQ(found.stringProperty(Property::bundlePath), bundle) << executable;
    }
}

TEST(BundleReader, ReadsNothingThatStrangersCouldHaveWritten) {
    const TestFolder folder;
    folder.write("A.app/Info.plist", infoNaming("Main"));
    folder.write("A.app/Main", "");
    fs::create_directory_symlink("A.app", folder / "link");

    const struct {
        const char* changed;
        ::mode_t mode;
        const char* executable;
        bool found;
    } cases[] = {
        {"A.app", 0755, "A.app/Main", true},
        {"A.app", 01777, "A.app/Main", true},
        {"A.app", 0777, "A.app/Main", false},
        {"A.app/Main", 0666, "A.app/Main", false},
        {"A.app/Info.plist", 0666, "A.app/Main", false},
        {"A.app", 0755, "link/Main", false}, // a link is not how the kernel names a running file
    };

    for (const auto& c : cases) {
        const ::mode_t before = fs::is_directory(folder / c.changed) ? 0755 : 0644;
        ASSERT_EQ(::chmod((folder / c.changed).c_str(), c.mode), 0);
        const auto bundle = BundleReader::forTrustedExecutable(folder / c.executable);
        EXPECT_EQ(bundle.stringProperty(Property::bundlePath).has_value(), c.found)
            << c.changed << " " << std::oct << c.mode << " " << c.executable;
        ASSERT_EQ(::chmod((folder / c.changed).c_str(), before), 0);
    }
}
