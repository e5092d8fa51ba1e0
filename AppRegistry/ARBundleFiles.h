#pragma once

#include <array>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "AppRegistry/ARBundleRow.h"
#include "AppRegistry/ARFolder.h"

// Something that may be a bundle: a folder (or, of an extension point, a file) by its name in an
// opened folder.
struct ARCandidate {
    ARKind kind;
    const ARFolder& folder;
    std::string_view name;
    std::string_view path; // canonical
};

// The names of a candidate's counting files below its folder, from the name of its executable
// (empty when there is none); an empty one does not exist.
[[nodiscard]] std::array<std::string, countingFiles>
ARCountingFileNames(const ARCandidate& candidate, std::string_view executable);

// A name that "BQBundleExecutable" may have: one file directly in the bundle.
[[nodiscard]] bool ARIsExecutableName(std::string_view name);

// Looks at the files that make a bundle what it is, without opening them. Only for the time of
// one pass, on the thread of that pass; the ownership test must outlive it.
class ARBundleFiles {
public:
    explicit ARBundleFiles(platform::OwnershipTest& ownership) : ownership_(ownership) {}

    // Why the candidate's own folder cannot be trusted; nothing when it can.
    [[nodiscard]] std::optional<std::string> refusal(const ARCandidate& candidate) const;

    // The stamp of one file, all zero when it is missing. Else the reason why the bundle cannot
    // be trusted or read: a file of someone else, or one that is not regular.
    [[nodiscard]] std::expected<ARStamp, std::string> stamp(const ARCandidate& candidate,
                                                            const std::string& name) const;

    // True when the application is still being installed.
    [[nodiscard]] bool isPlaceholder(const ARCandidate& candidate) const;

private:
    [[nodiscard]] std::expected<ARStamp, std::string>
    stampBehindLink(const std::string& path) const;

    platform::OwnershipTest& ownership_;
};
