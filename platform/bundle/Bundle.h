#pragma once

#include <expected>
#include <optional>
#include <string>

#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// One bundle directory, read without loading it: a folder with Info.plist (any property-list
// format) at its top, which may name an executable ("BQBundleExecutable") inside the folder.
// Plain data; may be invalid (then it has no path). Any thread.
class BundleReader {
public:
    enum class Property { bundlePath, executablePath, supportPath };

    // A larger Info.plist is not read.
    static constexpr std::size_t largestInfo = 1024 * 1024;

    // The bundle at a directory path, or why there is none: no property list can be read.
    [[nodiscard]] static std::expected<BundleReader, Error> read(const std::string& path);
    // The same; invalid when there is none.
    [[nodiscard]] static BundleReader atPath(const std::string& path);
    // One whose Info.plist was read before: nothing but the executable is looked for again.
    [[nodiscard]] static BundleReader known(std::string canonicalPath, Value info);
    // The nearest enclosing folder whose Info.plist names this very file as its executable.
    [[nodiscard]] static BundleReader forExecutable(const std::string& path);
    // The same for a program that someone else runs: nothing is read that others than root and
    // this process's user could have put there (OwnershipTest.h), be it program or Info.plist.
    [[nodiscard]] static BundleReader forTrustedExecutable(const std::string& path);

    // The executable path is there only when the bundle names a regular file right in its folder.
    [[nodiscard]] std::optional<std::string> stringProperty(Property property) const;

    // What Info.plist holds; in a sound bundle a dictionary.
    [[nodiscard]] const std::optional<Value>& info() const { return info_; }

    [[nodiscard]] const Dictionary* infoDictionary() const {
        return info_ ? info_->dictionary() : nullptr;
    }

private:
    template <class MayRead>
    [[nodiscard]] static BundleReader nearestNaming(const std::string& executable,
                                                    MayRead&& mayRead);
    [[nodiscard]] std::optional<std::string> executablePath() const;

    std::optional<std::string> path_; // canonical
    std::optional<Value> info_;
};

// "<BundleReader path>", for log lines.
[[nodiscard]] std::string describe(const BundleReader& bundle);

} // namespace platform
