#include "platform/signing/FileHashes.h"

#include <optional>
#include <sys/stat.h>

namespace platform {

namespace {

std::optional<FileStamp> stampOfOpen(int file) {
    struct ::stat status = {};
    return ::fstat(file, &status) == 0 ? std::optional(FileStamp::of(status)) : std::nullopt;
}

} // namespace

std::expected<Sha256Digest, std::string> FileHashes::of(int file, std::uint64_t largest) {
    const auto before = stampOfOpen(file);
    if (!before)
        return std::unexpected("it cannot be looked at");
    if (before->size > largest)
        return std::unexpected("it is larger than " + std::to_string(largest) + " bytes");
    // One that changed just now may change again without showing it.
    const bool settled = before->settled();
    const Key key(before->device, before->inode, before->size, before->changedNanoseconds);
    if (const auto digest = known(key))
        return *digest;
    auto digest = Sha256().ofOpenFile(file, before->size);
    if (digest && stampOfOpen(file) != before)
        return std::unexpected("it changed while it was read");
    if (digest && settled)
        remember(key, *digest);
    return digest;
}

std::optional<Sha256Digest> FileHashes::known(const Key& key) {
    const std::lock_guard lock(mutex_);
    const auto found = known_.find(key);
    return found == known_.end() ? std::nullopt : std::optional(found->second);
}

void FileHashes::remember(const Key& key, const Sha256Digest& digest) {
    const std::lock_guard lock(mutex_);
    if (known_.size() >= mostRemembered)
        known_.clear();
    known_.insert_or_assign(key, digest);
}

} // namespace platform
