#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/bundle/Bundle.h"
#include "platform/value/Value.h"

// One bundle on disk, read when this was made: where it is, what it says of itself, where its
// embedded plug-ins live. May stand for no bundle at all: then every answer is absent. A plain
// value; any thread.
class ZPBundle {
public:
    explicit ZPBundle(platform::BundleReader reader) : reader_(std::move(reader)) {}

    // The bundle of the running program.
    [[nodiscard]] static ZPBundle forMainBundle();
    // The bundle at a directory.
    [[nodiscard]] static ZPBundle atPath(const std::string& path);
    [[nodiscard]] static ZPBundle atURL(std::string_view fileUrl);
    // The bundle that an executable belongs to; a bundle's own directory serves as well.
    [[nodiscard]] static ZPBundle forExecutablePath(const std::string& path);
    // The bundle that another process's executable belongs to; none where strangers could have made
    // it one.
    [[nodiscard]] static ZPBundle forTrustedExecutablePath(const std::string& path);
    [[nodiscard]] static ZPBundle forExecutableURL(std::string_view fileUrl);

    [[nodiscard]] std::optional<std::string>
    stringProperty(platform::BundleReader::Property property) const;

    [[nodiscard]] std::optional<std::string> path() const;
    [[nodiscard]] std::optional<std::string> url() const;
    // The bundle's own path when it has no executable.
    [[nodiscard]] std::optional<std::string> executablePath() const;
    [[nodiscard]] std::optional<platform::Dictionary> infoDictionary() const;
    [[nodiscard]] std::optional<std::string> bundleIdentifier() const;
    [[nodiscard]] std::optional<std::string> supportPath() const;
    // A directory of this name among the support files.
    [[nodiscard]] std::optional<std::string> bundleDirectory(std::string_view name) const;
    [[nodiscard]] std::optional<std::string> plugInsPath() const;

private:
    platform::BundleReader reader_;
};
