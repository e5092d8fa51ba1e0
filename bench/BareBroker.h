#pragma once

#include <cstddef>
#include <string>
#include <sys/types.h>

namespace bench {

// The least that a descriptor costs which another process opens: a process of this very program
// that takes a connection, reads a request, opens a folder or file, and passes its descriptor with
// a reply. Blocking, with no more work than that. Ended when this goes.
class BareBroker {
public:
    struct Sizes {
        std::size_t request;
        std::size_t reply;
    };

    // Its socket is "bare" below `folder`; it opens `path`.
    BareBroker(const std::string& folder, const std::string& path, const Sizes& sizes);
    BareBroker(const BareBroker&) = delete;
    BareBroker& operator=(const BareBroker&) = delete;
    ~BareBroker();

    [[nodiscard]] pid_t pid() const { return pid_; }

    // Connects, asks, gets a descriptor and closes it.
    void ask() const;

private:
    std::string socketPath_;
    Sizes sizes_;
    pid_t pid_ = -1;
};

} // namespace bench
