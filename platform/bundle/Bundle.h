#pragma once

#include <optional>
#include <string>

#include "platform/value/Value.h"

namespace platform {

// One bundle directory, read without loading it: a folder with Info.plist (any property-list
// format) at its top, which may name an executable ("BQBundleExecutable") inside the folder.
// Plain data; may be invalid (then it has no path). Any thread.
class BundleReader {
public:
    enum class Property { bundlePath, executablePath, supportPath };

    // The bundle at a directory path; invalid when there is no readable Info.plist.
    [[nodiscard]] static BundleReader atPath(const std::string& path);
    // The nearest enclosing folder whose Info.plist names this very file as its executable.
    [[nodiscard]] static BundleReader forExecutable(const std::string& path);

    [[nodiscard]] std::optional<std::string> stringProperty(Property property) const;

    [[nodiscard]] const std::optional<Dictionary>& infoDictionary() const { return info_; }

private:
    std::optional<std::string> path_; // canonical
    std::optional<Dictionary> info_;
};

} // namespace platform
