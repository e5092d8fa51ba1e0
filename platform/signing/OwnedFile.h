#pragma once

#include <expected>
#include <string>
#include <sys/stat.h>

#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"

namespace platform {

// A regular file that passed the ownership test, opened for reading. Movable, owned by one.
struct OwnedFile {
    std::string path;
    UniqueFd file;
    struct ::stat status = {};

    // Opens it without ever blocking on it, and not through a symbolic link. Nothing is opened
    // before its path has passed. On failure the reason.
    [[nodiscard]] static std::expected<OwnedFile, std::string> open(std::string path,
                                                                    OwnershipTest& ownership);
};

} // namespace platform
