#include "zpctl/Arguments.h"

#include "platform/file/File.h"
#include "platform/value/Uuid.h"

namespace zpctl {

std::string complaintAboutUuid(const std::string& text) {
    return platform::Uuid::parse(text) ? std::string() : "not a UUID: " + text;
}

std::string complaintAboutEmpty(const std::string& text) {
    return text.empty() ? "must not be empty" : std::string();
}

std::string absolutePath(const std::string& path) {
    if (auto canonical = platform::canonicalPath(path))
        return *canonical;
    const auto here = platform::canonicalPath(".");
    return path.starts_with('/') || !here ? path : *here + '/' + path;
}

} // namespace zpctl
