#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/file/PathWatch.h"

namespace platform {

// Notices the posts of one notification of FileNotifications. The counter file, its folder and the
// folders above may not be there yet, go, and come back. Whoever owns it waits for `descriptor` to
// become readable, but no longer than `patience`, and then calls `handleEvents`; one thread at a
// time.
class FileNotificationObserver {
public:
    // What was posted before counts as noticed. REQUIRES: `name` is a plain name.
    FileNotificationObserver(const std::string& folder, std::string_view name);

    // -1 when this box has no descriptor to spare: then posts are noticed by looking.
    [[nodiscard]] int descriptor() const { return watch_.descriptor(); }

    // In milliseconds as poll(2) takes them: for ever, unless the box cannot tell of all changes.
    [[nodiscard]] int patience() const;

    // Tells whether there was a post, or several, since the last one that was noticed. Never says
    // so without a change of the counter, and never leaves out the last post.
    [[nodiscard]] bool handleEvents();

private:
    // A counter file as it was seen. A file that was made anew counts from 0 again: which file it
    // is belongs to what is compared.
    struct Sighting {
        std::uint64_t device = 0;
        std::uint64_t inode = 0;
        std::int64_t born = 0; // nanoseconds; 0 where the file system does not tell
        std::array<unsigned char, 8> count = {};

        friend bool operator==(const Sighting&, const Sighting&) = default;
    };

    // False when the file is there but could not be read.
    [[nodiscard]] bool look(Sighting& seen) const;

    const std::string path_;
    PathWatch watch_; // set before the first look
    Sighting known_;
    bool unsure_ = false; // the last look did not tell
};

} // namespace platform
