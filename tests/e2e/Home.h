#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "tests/e2e/Item.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/platform/TestFolder.h"

namespace e2e {

namespace fs = std::filesystem;

// A temporary home of the daemon with the bundles in it; removed when this goes.
class Home {
public:
    Home();

    [[nodiscard]] const std::string& path() const { return folder_.path(); }

    [[nodiscard]] std::string operator/(const std::string& below) const { return folder_ / below; }

    // Makes an application with an executable; answers its path. `folder` is relative to the home.
    [[nodiscard]] std::string addApp(const std::string& name,
                                     const std::string& folder = "Applications",
                                     const Item& info = Item::map({})) const;
    // One with plug-ins that are called by their identifiers; answers its path.
    std::string addAppWithPlugIns(const std::string& name,
                                  const std::vector<std::string>& identifiers) const;

private:
    TestFolder folder_;
};

// What the tests say of a plug-in; what they leave out is not in its Info.plist.
struct PlugIn {
    std::string identifier = "com.example.plugin";
    std::string point = "com.tovana.widget";
    std::string version = "1.0";
    Item attributes = Item::map({}); // more entries of "HXExtensionAttributes"
    Item extension = Item::map({});  // more entries of "HXExtension"
    Item info = Item::map({});       // more entries at the top

    [[nodiscard]] Item infoDictionary() const;
};

// Puts a plug-in into an application; answers its path.
std::string addPlugIn(const std::string& app, const std::string& name, const PlugIn& plugIn);
// An application "NAME.app" with one plug-in "NAME.appex"; answers the plug-in's path.
std::string addAppWith(const Home& home, const std::string& name, const PlugIn& plugIn,
                       const std::string& folder = "Applications");

// Writes a file of the given mode, and the folders above it.
void writeFile(const std::string& path, const std::string& content, unsigned mode = 0644);
[[nodiscard]] std::string readFile(const std::string& path);

} // namespace e2e
