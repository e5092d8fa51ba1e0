#pragma once

#include <array>
#include <cstdint>
#include <expected>
#include <memory>
#include <string>
#include <string_view>

namespace platform {

// SHA-256 (FIPS 180-4, section 6.2).
using Sha256Digest = std::array<std::uint8_t, 32>;

// Makes digests of texts and files. Keeps a buffer and a hashing context between uses; one thread
// at a time. Owned by whoever hashes.
class Sha256 {
public:
    Sha256();
    ~Sha256();

    [[nodiscard]] Sha256Digest of(std::string_view bytes);
    // The file's content; opened without blocking, refused unless regular. On failure the reason.
    [[nodiscard]] std::expected<Sha256Digest, std::string> ofFile(const std::string& path);
    // What an open file holds from its start on, of at most `largest` bytes. On failure the reason.
    [[nodiscard]] std::expected<Sha256Digest, std::string> ofOpenFile(int file,
                                                                      std::uint64_t largest);

private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

} // namespace platform
