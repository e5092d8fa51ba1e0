#include <functional>

#include "platform/bundle/ExtensionPoints.h"
#include "platform/plist/PropertyList.h"
#include "tests/registry/RegistryFixture.h"

using platform::Dictionary;

namespace {

constexpr const char* identifier = "com.example.point";

std::string listOf(const char* text) {
    const Dictionary type{{"TypeIdentifier", text}, {"ConformsTo", "thing"}};
    return *platform::plist::writeXml(
        Dictionary{{"From", text}, {"TypeDeclarations", platform::Array{type}}});
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
    const auto writeBoth = [&](const std::string& content) {
        home.write("z/" + file, listOf("z"));
        home.write(first, content);
    };
    const auto link = [&](const std::string& to) {
        std::filesystem::create_symlink(home.write("else/" + to, listOf("e")), home / first);
    };
    const std::string sound = listOf("a");

    const std::tuple<const char*, std::function<void()>, bool> cases[] = {
        {"none", [] {}, false},
        {"in one folder", [&] { home.write("z/" + file, listOf("z")); }, true},
        {"in both", [&] { writeBoth(sound); }, true},
        {"the first broken", [&] { writeBoth("broken"); }, true},
        {"as deep as may be", [&] { home.write(first, nestedList(32)); }, true},
        {"too deep", [&] { home.write(first, nestedList(33)); }, false},
        {"too large", [&] { home.write(first, sound + std::string(1 << 20, ' ')); }, false},
        {"writable by others", [&] { setMode(home.write(first, sound), 0666); }, false},
        {"in a folder of someone else",
         [&] {
             home.write(first, sound);
             giveAway(home / "a");
         },
         false},
        {"a folder", [&] { home.write(first + "/x", "x"); }, false},
        {"a FIFO", [&] { makeFifo(home / first); }, false},
        {"a link", [&] { link(file); }, true},
        {"a link to another name", [&] { link("x.plist"); }, false},
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
        // What a link leads to is an extension point by its own name.
        EXPECT_EQ(types.conforms("e", "thing"), std::string_view(what).starts_with("a link"));
        EXPECT_FALSE(types.conforms("thing", "e"));
    }
}
