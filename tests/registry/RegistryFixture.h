#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "AppRegistry/ARRegistry.h"
#include "platform/container/FolderContainers.h"
#include "platform/types/DeclaredTypes.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/FakePlatform.h"
#include "tests/support/Files.h"
#include "tests/support/LogOf.h"

using Strings = std::vector<std::string>;

// A temporary home with bundles in it, and the registry over it: opened, closed and opened again
// as the daemon would.
class RegistryTest : public testing::Test {
protected:
    RegistryTest();

    // Writes an application or a plug-in (path relative to the home) with an info dictionary.
    void makeBundle(std::string_view path, const platform::Dictionary& info) const;
    void makeApplication(std::string_view path, std::string_view identifier) const;
    void makePlugIn(std::string_view path, std::string_view identifier,
                    std::string_view point = "com.tovana.point") const;
    void remove(std::string_view path) const;

    // Longer than the tick of a file system's clock, so that a stamp can be told from the next.
    static void letClockTick() { std::this_thread::sleep_for(std::chrono::milliseconds(50)); }

    [[nodiscard]] static platform::Dictionary plugInInfo(std::string_view identifier,
                                                         std::string_view point);

    // Opens the registry anew; the one before is closed first. Returns what it logged.
    std::string open();
    // In how many places of a log the text stands.
    [[nodiscard]] static std::size_t linesWith(std::string_view log, std::string_view text);
    // Changes the database of the registry, which is closed first.
    void execute(const char* sql);

    [[nodiscard]] ARZephrinProxy::Ptr at(std::string_view path) const;
    // The UUID of the plug-in at a path, all zero when there is none.
    [[nodiscard]] platform::Uuid uuidOf(std::string_view path) const;
    // The identifiers of all plug-ins, in the registry's order.
    [[nodiscard]] Strings identifiers() const;
    [[nodiscard]] Strings matching(const platform::Value& pointPattern) const;

    TestFolder home;
    platform::Places places;
    FakeLocale locale;
    platform::FolderContainers containers;
    platform::DeclaredTypes types;
    FakeSigning signing;
    std::unique_ptr<ARRegistry> registry;
};
