#pragma once

#include <cstddef>
#include <cstdint>
#include <expected>
#include <map>
#include <mutex>
#include <string>

#include "platform/digest/Sha256.h"
#include "platform/file/File.h"

namespace platform {

// SHA-256 of open files, each read once for its device, inode, size and change time. Owned by the
// verifier; any thread.
class FileHashes {
public:
    // With one more, all are forgotten.
    static constexpr std::size_t mostRemembered = 1024;

    // Of a file of at most `largest` bytes. On failure the reason.
    [[nodiscard]] std::expected<Sha256Digest, std::string> of(int file, std::uint64_t largest);

private:
    using Key = std::tuple<std::uint64_t, std::uint64_t, std::uint64_t, std::int64_t>;

    [[nodiscard]] std::optional<Sha256Digest> known(const Key& key);
    void remember(const Key& key, const Sha256Digest& digest);

    std::mutex mutex_; // of what is remembered; not held while a file is read
    std::map<Key, Sha256Digest> known_;
};

} // namespace platform
