#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <sys/stat.h>

namespace zpctl {

// Makes a copy of a folder that the daemon can trust: of regular files, folders and symbolic
// links (kept as links); anything else is refused. What only its group or others could write and
// set-id bits are dropped; the copy belongs to who makes it, and is on disk when it is made. The
// source may be hostile, and change meanwhile: no link in it is followed, no file waited for.
class TreeCopy {
public:
    // Folders in folders; deeper ones are refused.
    static constexpr std::size_t deepest = 64;

    // Copies the folder at `source` to the new folder `name` in the open one. On failure the
    // reason; what was copied so far is left to the caller.
    [[nodiscard]] static std::optional<std::string> make(const std::string& source, int into,
                                                         const std::string& name);

private:
    // One folder and its copy, both open.
    struct Pair {
        int from;
        int to;
        std::string path; // of the source, for messages
        std::size_t depth;
    };

    using Failure = std::optional<std::string>;

    [[nodiscard]] static Failure entries(const Pair& folder);
    [[nodiscard]] static Failure entry(const Pair& folder, const std::string& name);
    [[nodiscard]] static Failure file(const Pair& folder, const std::string& name);
    [[nodiscard]] static Failure link(const Pair& folder, const std::string& name);
    [[nodiscard]] static Failure folder(const Pair& outer, const std::string& name);
    // The copy of an open folder, with what is in it.
    [[nodiscard]] static Failure contents(int from, int into, const std::string& name,
                                          const std::string& path, std::size_t depth);
};

} // namespace zpctl
