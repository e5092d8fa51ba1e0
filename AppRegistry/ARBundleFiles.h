#pragma once

#include <array>
#include <cstdint>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "AppRegistry/ARBundleRow.h"
#include "AppRegistry/ARFolder.h"

class ARWatches;

// Something that may be a bundle: a folder (or, of an extension point, a file) by its name in an
// opened folder.
struct ARCandidate {
    ARKind kind;
    const ARFolder& folder;
    std::string_view name;
    std::string_view path;   // canonical
    const std::string& item; // that its watches belong to
};

// The names of a candidate's counting files below its folder, from the name of its executable
// (empty when there is none); an empty one does not exist.
[[nodiscard]] std::array<std::string, countingFiles>
ARCountingFileNames(const ARCandidate& candidate, std::string_view executable);

// A name that "BQBundleExecutable" may have: one file directly in the bundle.
[[nodiscard]] bool ARIsExecutableName(std::string_view name);

// Looks at the files that make a bundle what it is, without opening them. Only for the time of
// one pass, on the thread of that pass; the ownership test and the watches must outlive it.
class ARBundleFiles {
public:
    ARBundleFiles(platform::OwnershipTest& ownership, ARWatches& watches)
        : ownership_(ownership), watches_(watches) {}

    // What the candidate's own folder goes by in its file system, nothing when it is gone since it
    // was listed, or why it cannot be trusted.
    [[nodiscard]] std::expected<std::optional<std::uint64_t>, std::string>
    folderOf(const ARCandidate& candidate) const;

    // The stamp of one file, all zero when it is missing. Else the reason why the bundle cannot
    // be trusted or read: a file of someone else, or one that is not regular.
    [[nodiscard]] std::expected<ARStamp, std::string> stamp(const ARCandidate& candidate,
                                                            const std::string& name) const;

    // True when the application is still being installed.
    [[nodiscard]] bool isPlaceholder(const ARCandidate& candidate) const;

private:
    [[nodiscard]] std::expected<ARStamp, std::string>
    stampBehindLink(const std::string& path, const std::string& item) const;

    platform::OwnershipTest& ownership_;
    ARWatches& watches_;
};
