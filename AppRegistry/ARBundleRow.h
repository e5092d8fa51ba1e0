#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <vector>

#include "platform/digest/Sha256.h"
#include "platform/file/File.h"
#include "platform/value/SharedBytes.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

// What an entry of the registry is. The numbers are stored.
enum class ARKind : std::uint8_t { application = 0, plugIn = 1, extensionPoint = 2 };

// Why an entry is there. The numbers are stored.
enum class ARPresence : std::uint8_t {
    found = 0,     // lies in a watched folder
    added = 1,     // was registered by path
    withdrawn = 2, // was unregistered: known, but kept away until it changes
};

// The files whose content makes a bundle what it is. An extension point has the first one only.
inline constexpr std::size_t countingFiles = 3;

enum ARCountingFile : std::size_t { infoFile = 0, executableFile = 1, signatureFile = 2 };

// A larger file counts by its stamp alone.
inline constexpr std::uint64_t ARLargestHashed = std::uint64_t{256} << 20;

// Tells whether a counting file is still the one that was read; all zero when there is none.
// The device is left out: its number may differ after each start of the box.
struct ARStamp {
    std::uint64_t inode = 0;
    std::uint64_t size = 0;
    std::int64_t changed = 0; // nanoseconds; 0 for a file too fresh to be told from its successor

    [[nodiscard]] bool present() const noexcept { return inode != 0; }

    friend bool operator==(const ARStamp&, const ARStamp&) = default;
};

using ARStamps = std::array<ARStamp, countingFiles>;
// All zero for a file that is missing or too large to be hashed.
using ARDigest = platform::Sha256Digest;
using ARDigests = std::array<ARDigest, countingFiles>;

// One entry of the registry as the database keeps it, less its info dictionary, which is fetched
// when asked for. Plain data; the texts are shared between copies.
struct ARBundleRow {
    std::int64_t id = 0; // given in order of registration; never used twice by one process
    ARKind kind = ARKind::plugIn;
    ARPresence presence = ARPresence::found;
    bool placeholder = false;   // an application that is still being installed
    bool declaresTypes = false; // has "TypeDeclarations"
    platform::Uuid uuid;
    platform::SharedBytes path; // canonical
    platform::SharedBytes identifier;
    platform::SharedBytes originalIdentifier;
    std::optional<platform::SharedBytes> bundleIdentifier; // "BQBundleIdentifier"
    std::optional<platform::SharedBytes> bundleVersion;    // "BQBundleVersion"
    platform::SharedBytes executable;                      // file name; empty when there is none
    platform::Date registered;
    ARStamps stamps;
    std::vector<platform::SharedBytes> points; // keys for the extension point index
};

// True for what the folders do not tell: a plug-in that was registered or unregistered by path.
[[nodiscard]] inline bool ARIsRegisteredByPath(const ARBundleRow& row) {
    return row.kind == ARKind::plugIn && row.presence != ARPresence::found;
}
