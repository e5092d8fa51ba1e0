#include "bench/Bundles.h"

#include <algorithm>
#include <filesystem>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/PlistWriter.h"

namespace bench {

using e2e::Item;

namespace {

Item metadataOf(std::size_t bytes, std::size_t seed) {
    constexpr std::size_t entries = 20;
    Item metadata = Item::map({});
    const std::size_t each = bytes / entries;
    for (std::size_t i = 0; i < entries; ++i) {
        const std::string key = "MetadataEntry" + std::to_string(i);
        std::string text = "text " + std::to_string(seed * entries + i) + " ";
        text.resize(each > key.size() + text.size() ? each - key.size() : text.size(), 'm');
        metadata.set(key, text);
    }
    return metadata;
}

e2e::PlugIn plugIn(std::size_t number, std::size_t metadata) {
    return {.identifier = "com.example.bench.plugin" + std::to_string(number),
            .point = extensionPoint(number % extensionPoints),
            .info = Item::map({{"Metadata", metadataOf(metadata, number)}})};
}

std::string executableOf(std::size_t bytes, std::size_t number) {
    std::string content = "#!/bin/sh\n# " + std::to_string(number) + "\n";
    content.resize(std::max(bytes, content.size()), '#');
    return content;
}

} // namespace

std::string extensionPoint(std::size_t number) {
    return "com.example.bench.point" + std::to_string(number);
}

void fill(const e2e::Home& home, const Mix& mix) {
    std::string app;
    for (std::size_t i = 0; i < mix.plugIns; ++i) {
        if (i % mix.perApplication == 0)
            app = home.addApp("App" + std::to_string(i / mix.perApplication));
        const std::string path = app + "/PlugIns/P" + std::to_string(i) + ".appex";
        e2e::writeFile(path + "/Info.plist",
                       e2e::xmlPlist(plugIn(i, mix.metadata).infoDictionary()));
        if (mix.executable > 0)
            e2e::writeFile(path + "/plugin", executableOf(mix.executable, i), 0755);
    }
}

std::string pathOf(const e2e::Home& home, std::size_t number) {
    return home / ("Applications/App" + std::to_string(number / Mix().perApplication) +
                   ".app/PlugIns/P" + std::to_string(number) + ".appex");
}

std::string addPlugInWithForm(const e2e::Home& home, std::size_t size) {
    constexpr std::size_t rest = 1500; // what a form has besides its metadata, about
    e2e::PlugIn wanted = plugIn(0, size - rest);
    wanted.identifier = "com.example.bench.find";
    wanted.point = "com.example.bench.find";
    return e2e::addAppWith(home, "Find", wanted);
}

std::string addRunningPlugIn(const e2e::Home& home) {
    const std::string path = e2e::addAppWith(
        home, "Running", {.identifier = runningIdentifier, .point = "com.example.bench.running"});
    std::filesystem::copy_file(e2e::builtProgram("bench_one_byte"), path + "/plugin",
                               std::filesystem::copy_options::overwrite_existing);
    std::filesystem::permissions(path + "/plugin", std::filesystem::perms(0755));
    return path;
}

} // namespace bench
