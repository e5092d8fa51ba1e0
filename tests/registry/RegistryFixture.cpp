#include "tests/registry/RegistryFixture.h"

#include <sqlite3.h>

#include "platform/plist/PropertyList.h"

using platform::Dictionary;

RegistryTest::RegistryTest()
    : places(platform::Places::forHome(home.path())),
      containers(places.containers),
      types(places.types) {
    std::filesystem::create_directories(home / "Applications");
}

void RegistryTest::makeBundle(std::string_view path, const Dictionary& info) const {
    home.write(std::string(path) + "/Info.plist", *platform::plist::writeXml(info));
}

void RegistryTest::makeApplication(std::string_view path, std::string_view identifier) const {
    makeBundle(path, {{"BQBundleIdentifier", identifier}});
}

void RegistryTest::makePlugIn(std::string_view path, std::string_view identifier,
                              std::string_view point) const {
    makeBundle(path, plugInInfo(identifier, point));
    home.write(std::string(path) + "/program", "code of " + std::string(identifier));
}

void RegistryTest::remove(std::string_view path) const {
    std::filesystem::remove_all(home / path);
}

Dictionary RegistryTest::plugInInfo(std::string_view identifier, std::string_view point) {
    return {{"BQBundleIdentifier", identifier},
            {"BQBundleExecutable", "program"},
            {"BQBundleVersion", "1.0"},
            {"HXExtension", Dictionary{{"HXExtensionPointIdentifier", point}}}};
}

std::string RegistryTest::open() {
    return logOf([this] {
        registry.reset();
        auto opened = ARRegistry::open(places, locale, containers, types, signing);
        ASSERT_TRUE(opened) << describe(opened.error());
        registry = std::move(*opened);
    });
}

std::size_t RegistryTest::linesWith(std::string_view log, std::string_view text) {
    std::size_t found = 0;
    for (auto at = log.find(text); at != log.npos; at = log.find(text, at + 1))
        ++found;
    return found;
}

void RegistryTest::execute(const char* sql) {
    registry.reset();
    sqlite3* handle = nullptr;
    ASSERT_EQ(sqlite3_open(places.registryDatabase.c_str(), &handle), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(handle, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sql;
    sqlite3_close(handle);
}

ARZephrinProxy::Ptr RegistryTest::at(std::string_view path) const {
    return registry->zephrinProxyForPath(home / path);
}

platform::Uuid RegistryTest::uuidOf(std::string_view path) const {
    const auto proxy = at(path);
    return proxy ? proxy->plugInUUID() : platform::Uuid{};
}

namespace {

Strings identifiersOf(const ARApplicationWorkspace::PlugIns& plugIns) {
    Strings found;
    for (const auto& plugIn : plugIns)
        found.push_back(*plugIn->plugInIdentifier());
    return found;
}

} // namespace

Strings RegistryTest::identifiers() const {
    return identifiersOf(*registry->installedPlugins());
}

Strings RegistryTest::matching(const platform::Value& pointPattern) const {
    const Dictionary query{{"HXExtensionPointIdentifier", pointPattern}};
    return identifiersOf(*registry->pluginsMatchingQuery(query, {}));
}
