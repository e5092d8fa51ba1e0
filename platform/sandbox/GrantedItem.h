#pragma once

#include <expected>
#include <string>
#include <string_view>

#include "platform/file/File.h"
#include "platform/value/Error.h"

namespace platform {

// A regular file or a folder that was opened to be read by somebody else. Movable, owned by one.
struct GrantedItem {
    UniqueFd descriptor;
    bool isFolder = false;

    // Opens what lies at an absolute path, from the root folder down and one name at a time. No
    // link is followed. Nothing is opened that others than root and this process's user could have
    // put there, be it by a hard link in a folder of all, nor any file system that a program
    // serves; and nothing but regular files and folders is ever opened, so that no FIFO or device
    // notices. May wait for a disk. The error's code is an errno value; its text has no path.
    [[nodiscard]] static std::expected<GrantedItem, Error> open(const std::string& path);
};

// Whether a path is relative and leads nowhere but down.
[[nodiscard]] bool staysBelow(std::string_view path);

} // namespace platform
