#include "platform/signing/TrustFolder.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <expected>
#include <optional>
#include <set>
#include <sys/stat.h>
#include <system_error>
#include <vector>

#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"
#include "platform/signing/SigningLog.h"

namespace platform {

namespace {

constexpr std::string_view keyEnding = ".pem";

std::optional<FileStamp> linkStampOf(const std::string& path) {
    struct ::stat status = {};
    return ::lstat(path.c_str(), &status) == 0 ? std::optional(FileStamp::of(status))
                                               : std::nullopt;
}

// A file or folder as it was found; without a stamp there was none.
struct Seen {
    explicit Seen(std::string where)
        : path(std::move(where)), stamp(linkStampOf(path)), settled(!stamp || stamp->settled()) {}

    [[nodiscard]] bool unchanged() const { return linkStampOf(path) == stamp; }

    std::string path;
    std::optional<FileStamp> stamp;
    bool settled; // a later look can prove that it did not change
};

std::expected<std::vector<std::string>, int> keyFilesIn(const std::string& folder) {
    const std::unique_ptr<DIR, int (*)(DIR*)> opened(::opendir(folder.c_str()), &::closedir);
    if (!opened)
        return std::unexpected(errno);
    std::vector<std::string> files;
    while (const dirent* entry = ::readdir(opened.get())) {
        const std::string_view name = entry->d_name;
        if (name.ends_with(keyEnding) && !name.starts_with('.'))
            files.push_back(folder + "/" + entry->d_name);
    }
    std::ranges::sort(files);
    return files;
}

std::expected<PublicKey, std::string> readKey(const std::string& path, OwnershipTest& ownership) {
    struct ::stat status = {};
    if (::lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode))
        return std::unexpected("not a regular file");
    if (auto refusal = ownership.refusal(path))
        return std::unexpected(std::move(*refusal));
    const auto content = readRegularFile(path, TrustFolder::largestKey);
    if (!content)
        return std::unexpected(content.error().description.value_or("cannot be read"));
    return PublicKey::fromPem(content->bytes);
}

bool sameKeys(const TrustedKeys& a, const TrustedKeys& b) {
    return std::ranges::equal(a, b, {}, &TrustedKeys::value_type::first,
                              &TrustedKeys::value_type::first);
}

} // namespace

struct TrustFolder::State {
    // As it was when it was last read; `before` is what that look replaces.
    State(const std::string& path, const State* before);

    // Whether all is as it was, and was so long enough to tell.
    [[nodiscard]] bool holds(const std::string& path) const {
        return settled && canonicalPath(path).value_or("") == folder.path &&
               std::ranges::all_of(files, &Seen::unchanged) && folder.unchanged() &&
               (!folder.stamp || OwnershipTest().refusal(folder.path) == refusal);
    }

    Seen folder; // its canonical path; empty while there is none
    std::optional<std::string> refusal;
    std::vector<Seen> files;
    bool settled = true;
    std::shared_ptr<const TrustedKeys> keys;
    std::set<std::string> complaints;

private:
    void read();
    void readFolder(TrustedKeys& found);
    void readFile(const std::string& path, OwnershipTest& ownership, TrustedKeys& found);

    void complain(const std::string& path, const std::string& reason) {
        complaints.insert(path + ": " + reason);
    }
};

TrustFolder::State::State(const std::string& path, const State* before)
    : folder(canonicalPath(path).value_or("")) {
    read();
    settled = folder.settled && std::ranges::all_of(files, &Seen::settled);
    if (before && sameKeys(*before->keys, *keys))
        keys = before->keys;
    for (const std::string& complaint : complaints) {
        if (!before || !before->complaints.contains(complaint))
            signingLog().error("no trust in %{public}s", complaint);
    }
}

void TrustFolder::State::read() {
    TrustedKeys found;
    if (folder.stamp)
        readFolder(found);
    keys = std::make_shared<const TrustedKeys>(std::move(found));
}

void TrustFolder::State::readFolder(TrustedKeys& found) {
    OwnershipTest ownership;
    refusal = ownership.refusal(folder.path);
    if (refusal)
        return complain(folder.path, *refusal);
    const auto paths = keyFilesIn(folder.path);
    if (!paths)
        return complain(folder.path, std::generic_category().message(paths.error()));
    for (const std::string& path : *paths)
        readFile(path, ownership, found);
}

void TrustFolder::State::readFile(const std::string& path, OwnershipTest& ownership,
                                  TrustedKeys& found) {
    if (files.size() == mostKeys)
        return complain(folder.path, "more than " + std::to_string(mostKeys) + " keys");
    files.emplace_back(path); // before it is read: a change in between shows
    auto key = readKey(path, ownership);
    if (!key)
        return complain(path, key.error());
    found.emplace(std::string(key->identifier()), std::move(*key));
}

TrustFolder::TrustFolder(std::string path) : path_(std::move(path)) {}

TrustFolder::~TrustFolder() = default;

std::shared_ptr<const TrustedKeys> TrustFolder::keys() {
    const std::lock_guard lock(mutex_);
    if (!state_ || !state_->holds(path_))
        state_ = std::make_unique<const State>(path_, state_.get());
    return state_->keys;
}

} // namespace platform
