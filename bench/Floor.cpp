#include "bench/Floor.h"

#include <csignal>
#include <stdexcept>
#include <string>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace bench {

namespace {

bool sendAll(int fd, const char* bytes, std::size_t size) {
    while (size > 0) {
        const ssize_t sent = send(fd, bytes, size, MSG_NOSIGNAL);
        if (sent <= 0)
            return false;
        bytes += sent;
        size -= static_cast<std::size_t>(sent);
    }
    return true;
}

void serve(int fd, std::size_t requestSize, std::size_t replySize) {
    constexpr std::size_t most = 64; // requests answered by one write
    std::vector<char> input(requestSize * most);
    const std::vector<char> replies(replySize > (1u << 20) ? replySize : replySize * most, 'x');
    std::size_t waiting = 0; // bytes of requests not yet answered
    for (;;) {
        const ssize_t got = recv(fd, input.data(), input.size() - waiting, 0);
        if (got <= 0)
            return;
        waiting += static_cast<std::size_t>(got);
        std::size_t left = waiting / requestSize;
        waiting %= requestSize;
        while (left > 0) {
            const std::size_t together = std::min(left, replies.size() / replySize);
            if (!sendAll(fd, replies.data(), together * replySize))
                return;
            left -= together;
        }
    }
}

} // namespace

Floor::Floor(std::size_t requestSize, std::size_t replySize) {
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0)
        throw std::runtime_error("socketpair failed");
    pid_ = fork();
    if (pid_ < 0)
        throw std::runtime_error("fork failed");
    if (pid_ == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        close(ends[0]);
        serve(ends[1], requestSize, replySize);
        _exit(0);
    }
    close(ends[1]);
    fd_ = ends[0];
}

Floor::~Floor() {
    close(fd_);
    waitpid(pid_, nullptr, 0);
}

} // namespace bench
