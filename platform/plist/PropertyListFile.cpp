#include "platform/plist/PropertyListFile.h"

#include <expected>

#include "platform/file/OwnershipTest.h"
#include "platform/log/Log.h"
#include "platform/plist/DictionaryFile.h"

namespace platform {

namespace {

std::expected<Dictionary, std::string> readTrusted(const std::string& path, std::size_t largest) {
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return Dictionary(); // gone in this moment
    OwnershipTest ownership;
    return readTrustedDictionary(*canonical, largest, ownership);
}

} // namespace

bool PropertyListFile::refresh() {
    const auto now = stampOf(path_);
    if (known_ && now == stamp_)
        return false;
    stamp_ = now;
    // A file that changed just now may change again without showing it: look once more then.
    known_ = !now || now->settled();
    read();
    return true;
}

void PropertyListFile::read() {
    auto found = stamp_ ? readTrusted(path_, largest_) : Dictionary();
    const std::string complaint = found ? "" : found.error();
    if (!complaint.empty() && complaint != complaint_) {
        log::defaultLog().error("ignoring %{public}s: %{public}s", path_, complaint);
    }
    complaint_ = complaint;
    dictionary_ = found ? std::move(*found) : Dictionary();
}

} // namespace platform
