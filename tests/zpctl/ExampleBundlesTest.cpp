// The sample applications are what people copy from: their bundles must be whole.

#include <filesystem>
#include <map>
#include <string>
#include <unistd.h>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "zpctl/DictionaryFile.h"
#include "zpctl/Json.h"

namespace {

namespace fs = std::filesystem;
using nlohmann::json;

const fs::path root = EXAMPLE_BUNDLES;

json contentOf(const fs::path& file) {
    return zpctl::toJson(zpctl::dictionaryFromFile(file).value());
}

std::string textAt(const json& info, const char* place) {
    return info.value(json::json_pointer(place), "");
}

TEST(ExampleBundles, HaveTheirProgramAndNameAnExtensionPointThatIsThere) {
    std::map<std::string, int> found;
    for (const auto& entry : fs::recursive_directory_iterator(root / "Applications")) {
        const fs::path& bundle = entry.path();
        const std::string kind = bundle.extension();
        if (kind != ".app" && kind != ".appex")
            continue;
        SCOPED_TRACE(bundle);
        ++found[kind];
        const json info = contentOf(bundle / "Info.plist");
        EXPECT_NE(textAt(info, "/BQBundleIdentifier"), "");
        if (textAt(info, "/HXExtension/HXExtensionProtocol") != "#Data") {
            const std::string program = textAt(info, "/BQBundleExecutable");
            EXPECT_NE(program, "");
            EXPECT_EQ(access((bundle / program).c_str(), X_OK), 0) << program;
        }
        if (kind == ".appex") {
            EXPECT_NE(textAt(info, "/HXExtension/HXExtensionAttributes/HXExtensionVersion"), "");
            const std::string point = textAt(info, "/HXExtension/HXExtensionPointIdentifier");
            const fs::path points = root / "System/Library/ExtensionPoints";
            EXPECT_FALSE(contentOf(points / (point + ".plist")).empty());
        }
    }
    EXPECT_EQ(found, (std::map<std::string, int>{{".app", 2}, {".appex", 5}}));
}

} // namespace
