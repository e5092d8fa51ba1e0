#include "zpctl/Arguments.h"

#include <CLI/CLI.hpp>

#include "platform/file/File.h"
#include "platform/value/Uuid.h"

namespace zpctl {

void addPlugInArgument(CLI::App& command, std::string& uuid) {
    command.add_option("plug-in", uuid, "The plug-in's registration UUID")
        ->type_name("UUID")
        ->required()
        ->check(complaintAboutNoUuid);
}

void addPlugInArguments(CLI::App& command, std::vector<std::string>& uuids) {
    command.add_option("plug-ins", uuids, "The plug-ins' registration UUIDs")
        ->type_name("UUID")
        ->required()
        ->check(complaintAboutNoUuid);
}

std::vector<platform::Uuid> uuidsOf(const std::vector<std::string>& texts) {
    std::vector<platform::Uuid> uuids;
    for (const std::string& text : texts)
        uuids.push_back(platform::Uuid::parse(text).value());
    return uuids;
}

void addEnvironmentOption(CLI::App& command, std::vector<std::string>& variables) {
    command.add_option("--env", variables, "A variable for the plug-in's environment")
        ->type_name("NAME=VALUE")
        ->allow_extra_args(false)
        ->check([](const std::string& text) {
            const auto equals = text.find('=');
            return equals == 0 || equals == std::string::npos ? "not NAME=VALUE: " + text
                                                              : std::string();
        });
}

std::optional<platform::Dictionary> environmentOf(const std::vector<std::string>& variables) {
    if (variables.empty())
        return std::nullopt;
    platform::Dictionary environment;
    for (const std::string& text : variables) {
        const auto equals = text.find('=');
        environment.set(text.substr(0, equals), text.substr(equals + 1));
    }
    return environment;
}

std::string complaintAboutNoUuid(const std::string& text) {
    return platform::Uuid::parse(text) ? std::string() : "not a UUID: " + text;
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
