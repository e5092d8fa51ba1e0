#pragma once

#include <expected>
#include <string>

namespace zpctl {

// An application's folder as its Info.plist tells it. A plain value.
struct Application {
    std::string path; // canonical
    std::string name; // of the folder: "Cinema.app"
    std::string identifier;
    std::string version; // empty when it has none

    // The application at a path; on failure the reason, for a person.
    [[nodiscard]] static std::expected<Application, std::string> at(const std::string& path);
    // The same of a folder under whatever name.
    [[nodiscard]] static std::expected<Application, std::string> inFolder(const std::string& path);

    // Whether a folder of that name can be an application at all.
    [[nodiscard]] static bool isName(const std::string& name);

    // "com.example.cinema 1.2".
    [[nodiscard]] std::string title() const;
};

} // namespace zpctl
