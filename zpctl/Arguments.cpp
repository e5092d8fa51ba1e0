#include "zpctl/Arguments.h"

#include <CLI/CLI.hpp>

#include "platform/file/File.h"
#include "platform/value/Uuid.h"

namespace zpctl {

void addPlugInArgument(CLI::App& command, std::string& uuid) {
    command.add_option("plug-in", uuid, "The plug-in's registration UUID")
        ->type_name("UUID")
        ->required()
        ->check([](const std::string& text) {
            return platform::Uuid::parse(text) ? std::string() : "not a UUID: " + text;
        });
}

std::string complaintAboutEmpty(const std::string& text) {
    return text.empty() ? "must not be empty" : std::string();
}

std::string absolutePath(const std::string& path) {
    if (auto canonical = platform::canonicalPath(path))
        return *canonical;
    const auto here = platform::canonicalPath(".");
    return path.starts_with('/') || !here ? path : *here + '/' + path;
}

} // namespace zpctl
