#pragma once

#include <map>
#include <string>
#include <string_view>

#include "platform/file/File.h"

namespace platform {

// Notices changes of the file or folder at a path, and of what lies directly in such a folder,
// with inotify. The path, or folders above it, may come and go. Whoever owns it waits for
// `descriptor` to become readable and then calls `handleEvents`; one thread at a time.
class PathWatch {
public:
    // Symbolic links in the path are followed; above what they lead to nothing is watched.
    explicit PathWatch(std::string path);

    // Non-blocking; -1 when this box has no descriptor to spare: then changes are not seen.
    [[nodiscard]] int descriptor() const { return inotify_.get(); }

    // False when the box refused a watch: then not all changes are seen.
    [[nodiscard]] bool complete() const { return complete_; }

    // Takes up what happened since the last call. Tells whether the path, a folder above it or
    // what lies in it may be another one now, or belong to somebody else: perhaps so without need,
    // but never not when it is.
    [[nodiscard]] bool handleEvents();

private:
    void watchAll();
    void watch(const std::string& folder, const std::string& name);
    [[nodiscard]] bool readEvents();
    [[nodiscard]] bool matters(int watch, std::string_view name) const;

    const std::string path_;
    UniqueFd inotify_;
    // By number of the watch the one name that matters in its folder; empty where all do.
    std::map<int, std::string> watches_;
    bool present_ = false;  // whether there was anything at the path
    bool complete_ = false; // whether there is a watch on all that is there
};

} // namespace platform
