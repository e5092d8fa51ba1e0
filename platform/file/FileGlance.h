#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace platform {

// What the kernel has in memory of a file. Taking a glance asks no file system and waits for none:
// a file may lie on a slow one, or on one that a hostile user serves. A plain value.
struct FileGlance {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::uint32_t owner = 0;
    std::uint32_t group = 0;
    std::uint32_t mode = 0; // kind of file and permissions

    // Of an open file; the descriptor may be an O_PATH one.
    [[nodiscard]] static std::optional<FileGlance> of(int descriptor);
    // Of what a link in /proc (".../exe", ".../ns/user") leads to.
    [[nodiscard]] static std::optional<FileGlance> throughProc(const std::string& link);
    // Of what lies at a path. Nothing also when memory does not tell.
    [[nodiscard]] static std::optional<FileGlance> at(const std::string& path);

    [[nodiscard]] bool isSameFileAs(const FileGlance& other) const {
        return device == other.device && inode == other.inode;
    }

    // Whether this process may read it, by its capabilities or by owner, group and mode; further
    // access lists are left out.
    [[nodiscard]] bool mayRead() const;
};

} // namespace platform
