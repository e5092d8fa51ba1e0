#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

#include "AppRegistry/ARKeptFacts.h"
#include "AppRegistry/ARStore.h"
#include "tests/registry/RegistryFixture.h"

namespace {

constexpr uid_t first = ARPlugInUsers::first;

struct OwnedContainers final : platform::Containers {
    std::vector<ARPlugInUser> owned;

    std::expected<std::string, platform::Error>
    dataContainer(std::string_view identifier, std::optional<uid_t> /*owner*/) override {
        return std::string(identifier);
    }

    std::vector<ARPlugInUser> owners() override { return owned; }
};

uid_t ownerOf(const std::string& path) {
    struct ::stat status{};
    EXPECT_EQ(::lstat(path.c_str(), &status), 0) << path;
    return status.st_uid;
}

} // namespace

TEST(PlugInUsers, NeverHaveWhatIsKnownOrAContainerHas) {
    OwnedContainers containers;
    containers.owned = {{"adopted", first + 2}, {"roots", 0},          {"same", first + 2},
                        {"stored", first + 3},  {"beyond", first - 1}, {"last", first + 6}};
    ARPlugInUsers users(containers, true);
    users.knowStored({{"stored", first}, {"false", first}, {"silly", 7}});
    users.know({{"kept", first + 1}, {"stored", first + 5}});
    const ARPlugInUser expected[] = {
        {"stored", first},     {"adopted", first + 2}, {"new", first + 4},  {"new", first + 4},
        {"kept", first + 1},   {"roots", first + 5},   {"same", first + 7}, {"false", first + 8},
        {"beyond", first + 9}, {"last", first + 6}};
    for (const auto& [identifier, user] : expected)
        EXPECT_EQ(users.of(identifier), user) << identifier;
    EXPECT_EQ(users.all().size(), 9U);
    EXPECT_EQ(users.takeNew().size(), 8U); // all but the stored one
    EXPECT_TRUE(users.takeNew().empty());
    EXPECT_EQ(ARPlugInUsers(containers, false).of("stored"), std::nullopt);
}

TEST(PlugInUsers, AreSharedWhenAllAreGiven) {
    OwnedContainers containers;
    for (uid_t user = first; user < ARPlugInUsers::shared - 1; ++user)
        containers.owned.emplace_back(std::to_string(user), user);
    ARPlugInUsers users(containers, true);
    EXPECT_EQ(users.of("a"), ARPlugInUsers::shared - 1);
    for (const char* identifier : {"b", "c"})
        EXPECT_EQ(users.of(identifier), ARPlugInUsers::shared);
    EXPECT_EQ(users.of("a"), ARPlugInUsers::shared - 1);
}

// Two bundles of one plug-in share its id as they share its container; it outlives each of the
// places where it is kept.
TEST_F(RegistryTest, GivesEachPlugInAUserOfItsOwn) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "only root gives user ids";
    makePlugIn("Applications/B.app/PlugIns/Other.appex", "other");
    makePlugIn("Applications/B.app/PlugIns/Old.appex", "clock");
    makePlugIn("Applications/A.app/PlugIns/New.appex", "clock");
    makeApplication("Applications/A.app", "com.example.a");
    makeApplication("Applications/B.app", "com.example.b");
    const auto file = [this](const char* suffix) {
        return ARFileBeside(places.registryDatabase, suffix);
    };
    const std::vector<std::vector<std::string>> losses = {
        {}, {}, {file(".db")}, {file(".plist")}, {file(".db"), file(".plist")}};
    for (const auto& lost : losses) {
        open();
        const auto clock = at("Applications/B.app/PlugIns/Old.appex");
        EXPECT_EQ(clock->userIdentifier(), first);
        EXPECT_EQ(at("Applications/A.app/PlugIns/New.appex")->userIdentifier(), first);
        EXPECT_EQ(at("Applications/B.app/PlugIns/Other.appex")->userIdentifier(), first + 1);
        const std::string container = clock->dataContainerPath().value_or("none");
        EXPECT_EQ(ownerOf(container), first);
        EXPECT_EQ(ownerOf(container + "/tmp"), first);
        (void)at("Applications/B.app/PlugIns/Other.appex")->dataContainerPath();
        registry.reset();
        EXPECT_EQ(ARKeptFacts(file(".plist")).read().users,
                  (std::vector<ARPlugInUser>{{"clock", first}, {"other", first + 1}}));
        for (const std::string& path : lost)
            std::filesystem::remove(path);
    }
    open();
    EXPECT_EQ(at("Applications/B.app/PlugIns/Other.appex")->userIdentifier(), first + 1);
}

// A plug-in that owns its container may have put anything in the place of what is in it.
TEST_F(RegistryTest, GivesNothingThatAContainerLeadsTo) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "only root gives folders away";
    home.write("elsewhere/file", "");
    const std::string container = containers.dataContainer("x", first).value_or("none");
    std::filesystem::remove(container + "/tmp");
    std::filesystem::create_symlink(home / "elsewhere", container + "/tmp");
    EXPECT_EQ(containers.dataContainer("x", first + 1), container);
    EXPECT_EQ(ownerOf(container), first + 1);
    EXPECT_EQ(ownerOf(container + "/tmp"), 0U);
    EXPECT_EQ(ownerOf(home / "elsewhere"), 0U);
}
