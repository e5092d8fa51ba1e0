// The sample applications are what people copy from: their bundles must be whole.

#include <filesystem>
#include <set>
#include <string>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/file/File.h"
#include "platform/plist/PropertyList.h"

namespace {

namespace fs = std::filesystem;
using platform::Dictionary;
using platform::Value;

const fs::path root = EXAMPLE_BUNDLES;

Dictionary dictionaryIn(const fs::path& file) {
    const auto content = platform::readRegularFile(file, 1U << 20);
    if (!content)
        return {};
    const auto list = platform::plist::parse(content->bytes);
    return list && list->dictionary() ? *list->dictionary() : Dictionary();
}

std::string textAt(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    return std::string(value ? value->string().value_or("") : "");
}

Dictionary dictionaryAt(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    return value && value->dictionary() ? *value->dictionary() : Dictionary();
}

std::set<fs::path> foldersEndingIn(const std::string& suffix) {
    std::set<fs::path> found;
    for (const auto& entry : fs::recursive_directory_iterator(root / "Applications")) {
        if (entry.is_directory() && entry.path().extension() == suffix)
            found.insert(entry.path());
    }
    return found;
}

void expectExecutable(const fs::path& bundle, const Dictionary& info) {
    const fs::path file = bundle / textAt(info, "BQBundleExecutable");
    EXPECT_NE(file.filename(), "") << bundle;
    EXPECT_EQ(access(file.c_str(), X_OK), 0) << file;
}

TEST(ExampleBundles, ApplicationsHaveTheirProgram) {
    const auto applications = foldersEndingIn(".app");
    EXPECT_EQ(applications.size(), 2U);
    for (const fs::path& application : applications) {
        const Dictionary info = dictionaryIn(application / "Info.plist");
        EXPECT_NE(textAt(info, "BQBundleIdentifier"), "") << application;
        expectExecutable(application, info);
    }
}

TEST(ExampleBundles, PlugInsNameAnExtensionPointThatIsThere) {
    const auto plugIns = foldersEndingIn(".appex");
    EXPECT_EQ(plugIns.size(), 5U);
    for (const fs::path& plugIn : plugIns) {
        const Dictionary info = dictionaryIn(plugIn / "Info.plist");
        const Dictionary extension = dictionaryAt(info, "HXExtension");
        EXPECT_NE(textAt(info, "BQBundleIdentifier"), "") << plugIn;
        EXPECT_NE(textAt(dictionaryAt(extension, "HXExtensionAttributes"), "HXExtensionVersion"),
                  "")
            << plugIn;
        const std::string point = textAt(extension, "HXExtensionPointIdentifier");
        EXPECT_FALSE(
            dictionaryIn(root / "System/Library/ExtensionPoints" / (point + ".plist")).empty())
            << plugIn;
        if (textAt(extension, "HXExtensionProtocol") != "#Data")
            expectExecutable(plugIn, info);
    }
}

} // namespace
