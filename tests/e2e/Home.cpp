#include "tests/e2e/Home.h"

#include <fstream>
#include <sstream>
#include <stdexcept>
#include <sys/stat.h>

namespace e2e {

namespace {

// Bundles that others can write are not trusted, whatever mask the tests are run with.
[[maybe_unused]] const auto maskOfThisProcess = umask(022);

} // namespace

Home::Home() {
    fs::permissions(path(), fs::perms(0755));
    fs::create_directories(path() + "/Applications");
}

std::string Home::addApp(const std::string& name, const std::string& folder,
                         const Item& info) const {
    const std::string app = *this / folder + "/" + name + ".app";
    const Item basics =
        Item::map({{"BQBundleIdentifier", "com.example." + name}, {"BQBundleExecutable", name}});
    writeFile(app + "/Info.plist", xmlPlist(basics.merged(info)));
    writeFile(app + "/" + name, "#!/bin/sh\n", 0755);
    return app;
}

std::string Home::addAppWithPlugIns(const std::string& name,
                                    const std::vector<std::string>& identifiers) const {
    std::string app = addApp(name);
    for (const std::string& identifier : identifiers)
        addPlugIn(app, identifier, {.identifier = identifier});
    return app;
}

Item PlugIn::infoDictionary() const {
    const Item own = Item::map({{"HXExtensionPointIdentifier", point},
                                {"HXExtensionAttributes",
                                 Item::map({{"HXExtensionVersion", version}}).merged(attributes)}});
    return Item::map({{"BQBundleIdentifier", identifier},
                      {"BQBundleVersion", version},
                      {"BQBundleExecutable", "plugin"},
                      {"HXExtension", own.merged(extension)}})
        .merged(info);
}

std::string addPlugIn(const std::string& app, const std::string& name, const PlugIn& plugIn) {
    std::string path = app + "/PlugIns/" + name + ".appex";
    writeFile(path + "/Info.plist", xmlPlist(plugIn.infoDictionary()));
    writeFile(path + "/plugin", "#!/bin/sh\n# " + name + "\n", 0755);
    return path;
}

std::string addAppWith(const Home& home, const std::string& name, const PlugIn& plugIn,
                       const std::string& folder) {
    return addPlugIn(home.addApp(name, folder), name, plugIn);
}

void writeFile(const std::string& path, const std::string& content, unsigned mode) {
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << content;
    file.close();
    if (!file || chmod(path.c_str(), mode) != 0)
        throw std::runtime_error("cannot write " + path);
}

std::string readFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
}

} // namespace e2e
