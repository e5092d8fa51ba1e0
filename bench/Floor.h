#pragma once

#include <cstddef>
#include <sys/types.h>

namespace bench {

// The least that one hop through a unix socket costs: a process of this very program that reads
// requests of a fixed size and answers each with a fixed number of bytes, blocking, with no more
// work than that. Requests that came together are answered by one write. Ended when this goes.
class Floor {
public:
    Floor(std::size_t requestSize, std::size_t replySize);
    Floor(const Floor&) = delete;
    Floor& operator=(const Floor&) = delete;
    ~Floor();

    [[nodiscard]] int fd() const { return fd_; }

    [[nodiscard]] pid_t pid() const { return pid_; }

private:
    int fd_ = -1;
    pid_t pid_ = -1;
};

} // namespace bench
