#include <functional>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/bundle/ExtensionPoints.h"
#include "platform/plist/PropertyList.h"
#include "tests/registry/RegistryFixture.h"

using platform::Dictionary;

namespace {

constexpr const char* identifier = "com.example.point";

std::string listOf(const char* text) {
    return *platform::plist::writeXml(Dictionary{{"From", text}});
}

// As deep as an array of arrays can be in a dictionary of so many levels in all.
std::string nestedList(int levels) {
    std::string inner;
    for (int level = 2; level <= levels; ++level)
        inner = "<array>" + inner + "</array>";
    return "<plist version=\"1.0\"><dict><key>From</key>" + inner + "</dict></plist>";
}

} // namespace

// Hosts read extension points by themselves: what they see is what the registry knows.
TEST_F(RegistryTest, AgreesWithHostsOnExtensionPoints) {
    places.extensionPointFolders = {home / "z", home / "a"};
    const std::string file = std::string(identifier) + ".plist";
    const std::string first = "a/" + file;

    const std::tuple<const char*, std::function<void()>, bool> cases[] = {
        {"none", [] {}, false},
        {"in one folder", [&] { home.write("z/" + file, listOf("z")); }, true},
        {"in both",
         [&] {
             home.write("z/" + file, listOf("z"));
             home.write(first, listOf("a"));
         },
         true},
        {"the first broken",
         [&] {
             home.write("z/" + file, listOf("z"));
             home.write(first, "broken");
         },
         true},
        {"as deep as may be", [&] { home.write(first, nestedList(32)); }, true},
        {"too deep", [&] { home.write(first, nestedList(33)); }, false},
        {"too large", [&] { home.write(first, listOf("a") + std::string(1 << 20, ' ')); }, false},
        {"writable by others", [&] { ::chmod(home.write(first, listOf("a")).c_str(), 0666); },
         false},
        {"in a folder of someone else",
         [&] {
             home.write(first, listOf("a"));
             ASSERT_EQ(::chown((home / "a").c_str(), 12345, 12345), 0);
         },
         false},
        {"a folder", [&] { home.write(first + "/x", "x"); }, false},
        {"a FIFO", [&] { ASSERT_EQ(::mkfifo((home / first).c_str(), 0644), 0); }, false},
        {"a link",
         [&] {
             std::filesystem::create_symlink(home.write("else/" + file, listOf("e")), home / first);
         },
         true},
        {"a link to another name",
         [&] {
             std::filesystem::create_symlink(home.write("else/x.plist", listOf("e")), home / first);
         },
         false},
    };

    for (const auto& [what, prepare, known] : cases) {
        SCOPED_TRACE(what);
        for (const char* folder : {"a", "z", "else"}) {
            remove(folder);
            std::filesystem::create_directories(home / folder);
        }
        prepare();
        open();
        const auto point = registry->extensionPointForIdentifier(identifier);
        const auto read = platform::readExtensionPoint(places.extensionPointFolders, identifier);
        EXPECT_EQ(point.has_value(), known);
        EXPECT_EQ(read, point ? point->sdkEntry : std::nullopt);
    }
}
