#pragma once

#include <cstdint>
#include <expected>
#include <optional>
#include <string>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARBundleRow.h"
#include "platform/digest/Sha256.h"
#include "platform/value/Value.h"

// What was known of a bundle's files when they were last read.
struct ARKnownFiles {
    ARStamps stamps{};
    ARDigests digests{};
};

// One bundle as its files tell it. The row has no UUID, id and date of registration yet.
struct ARBundleContent {
    ARBundleRow row;
    ARDigests digests{};
    platform::Dictionary info;            // as the registry reports it
    std::optional<std::string> signature; // what its file `Signature` holds, unless too large
};

// Reads and checks one bundle: its info dictionary and the hashes of its counting files. On the
// thread of the pass that owns it.
class ARBundleReader {
public:
    static constexpr std::size_t largestSignature = std::size_t{256} << 10;

    explicit ARBundleReader(const ARBundleFiles& files) : files_(files) {}

    // Files that are the `known` ones are not hashed again. On failure the reason why the bundle
    // cannot be trusted or read.
    [[nodiscard]] std::expected<ARBundleContent, std::string> read(const ARCandidate& candidate,
                                                                   const ARKnownFiles& known);

private:
    using Names = std::array<std::string, countingFiles>;

    [[nodiscard]] std::expected<platform::Dictionary, std::string>
    readInfo(ARBundleContent& content, const ARCandidate& candidate, const std::string& name);
    [[nodiscard]] std::expected<void, std::string>
    readOther(ARBundleContent& content, const ARCandidate& candidate, const Names& names,
              ARCountingFile file, const ARKnownFiles& known);

    [[nodiscard]] std::expected<void, std::string> readSignature(ARBundleContent& content,
                                                                 const std::string& path);

    const ARBundleFiles& files_;
    platform::Sha256 hash_;
};

// True when a file is the one that was known, by its stamp alone.
[[nodiscard]] bool ARIsSameFile(const ARStamp& known, const ARStamp& now);

// True when all counting files are what they were, by stamp or by content.
[[nodiscard]] bool ARHasSameContent(const ARKnownFiles& known, const ARKnownFiles& now);

// The info dictionary of a registered bundle or extension point, read from its file; for the case
// that the database cannot tell.
[[nodiscard]] std::optional<platform::Dictionary> ARReadReportedInfo(const ARBundleRow& row);
