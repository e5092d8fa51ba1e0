#include "platform/preferences/FilePreferences.h"

#include "platform/file/File.h"

namespace platform {

PropertyListFile* FilePreferences::fileOf(std::string_view domain, bool refreshed) {
    auto found = files_.find(domain);
    const bool isNew = found == files_.end();
    if (isNew) {
        const std::string name = std::string(domain) + ".plist";
        if (!isPlainName(name))
            return nullptr;
        found = files_.try_emplace(std::string(domain), folder_ + "/" + name).first;
    }
    if (isNew || refreshed)
        found->second.refresh();
    return &found->second;
}

void FilePreferences::synchronize(std::string_view domain) {
    const std::lock_guard lock(mutex_);
    fileOf(domain, true);
}

std::optional<Value> FilePreferences::value(std::string_view domain, std::string_view key) {
    const std::lock_guard lock(mutex_);
    const auto* file = fileOf(domain, false);
    const Value* found = file ? file->dictionary().find(key) : nullptr;
    return found ? std::optional(*found) : std::nullopt;
}

} // namespace platform
