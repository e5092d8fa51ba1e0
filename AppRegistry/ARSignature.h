#pragma once

#include <cstdint>
#include <string>

#include "AppRegistry/ARBundleRow.h"

// The signature of a plug-in as the database keeps it. Plain data.
struct ARSignature {
    std::string content;      // of its file `Signature`
    std::string key;          // that it verified with when it was judged; empty when it did not
    std::string entitlements; // what it granted then, encoded
};

// The same with the entry that it belongs to.
struct ARSignatureOfEntry {
    std::int64_t id = 0;
    ARSignature signature;
};

// All that is needed to judge a signature again, without a look at a file.
struct ARSignatureFacts {
    ARSignature signature;
    ARDigests digests{};
};
