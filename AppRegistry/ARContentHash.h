#pragma once

#include <cstdint>
#include <expected>
#include <memory>
#include <string>
#include <string_view>

#include "AppRegistry/ARBundleRow.h"

// SHA-256 of texts and files. Keeps a buffer and a hashing context between uses; one thread at a
// time. Owned by whoever reads bundles.
class ARContentHash {
public:
    ARContentHash();
    ~ARContentHash();

    [[nodiscard]] ARDigest of(std::string_view bytes);
    // The file's content; opened without blocking, refused unless regular. On failure the reason.
    [[nodiscard]] std::expected<ARDigest, std::string> ofFile(const std::string& path);

private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};
