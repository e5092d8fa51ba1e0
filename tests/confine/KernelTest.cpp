// What would be enforced on other kernels, and what is refused.

#include <filesystem>

#include <gtest/gtest.h>

#include "platform/confine/PreparedConfinement.h"
#include "tests/platform/TestFolder.h"

using namespace platform;

namespace {

struct Difference {
    int landlock;
    const char* profile;
    Dictionary enforced; // in place of "landlock"
};

KernelFeatures with(int landlock) {
    return {.noNewPrivileges = true, .systemCallFilters = true, .landlock = landlock};
}

} // namespace

TEST(Kernels, AreToldByWhatIsEnforcedInPlaceOfWhatIsWanted) {
    const TestFolder folder;
    const Difference cases[] = {
        {6, "plugin", {}},
        {6, "keyboard", {}},
        {5, "plugin", {{"signals", "seccomp"}, {"unixSockets", "seccomp"}}},
        {2,
         "keyboard",
         {{"signals", "seccomp"},
          {"unixSockets", "seccomp"},
          {"devices", "seccomp"},
          {"network", "seccomp"},
          {"truncation", "seccomp"}}},
        {0,
         "plugin",
         {{"signals", "seccomp"},
          {"unixSockets", "seccomp"},
          {"devices", "seccomp"},
          {"truncation", "seccomp"},
          {"files", "nothing"}}},
    };
    for (const Difference& each : cases) {
        SCOPED_TRACE(each.landlock);
        const auto prepared = PreparedConfinement::prepare(
            {each.profile, folder.path(), folder.path(), 1879048192}, with(each.landlock));
        ASSERT_TRUE(prepared) << describe(prepared.error());
        const Dictionary told = prepared->describe();
        Dictionary expected = *told.findDictionary("wanted");
        for (const auto& [key, value] : each.enforced)
            expected.set(key, value);
        EXPECT_EQ(*told.findDictionary("enforced"), expected);
    }
}

TEST(Kernels, WithoutFiltersRunNoPlugIn) {
    const TestFolder folder;
    const ConfinementPlan plan{"plugin", folder.path(), {}, {}};
    EXPECT_FALSE(PreparedConfinement::prepare(plan, {.systemCallFilters = true, .landlock = 6}));
    EXPECT_FALSE(PreparedConfinement::prepare(plan, {.noNewPrivileges = true, .landlock = 6}));
    for (const ConfinementPlan& wrong :
         {ConfinementPlan{"none", folder.path(), {}, {}},
          ConfinementPlan{"plugin", folder / "missing", {}, {}},
          ConfinementPlan{"plugin", folder.path(), folder / "missing", {}}})
        EXPECT_FALSE(PreparedConfinement::prepare(wrong)) << wrong.profile << wrong.bundle;
    EXPECT_FALSE(profileMayReachDaemon("plugin"));
    EXPECT_FALSE(profileMayReachDaemon("none"));
}
