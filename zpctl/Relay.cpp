#include "zpctl/Relay.h"

#include <array>
#include <cerrno>
#include <climits>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace zpctl {

namespace {

constexpr std::size_t largestStep = 64UL << 10;
// As much as a pipe takes without blocking once it is writable.
constexpr std::size_t largestWrite = PIPE_BUF;

bool isForNow(int error) {
    return error == EAGAIN || error == EINTR;
}

} // namespace

Relay::End Relay::run() {
    while (socketSpeaks_ || !toOutput_.empty()) {
        const short socketEvents = static_cast<short>(
            (socketSpeaks_ && toOutput_.empty() ? POLLIN : 0) | (toSocket_.empty() ? 0 : POLLOUT));
        const bool wantsInput = inputOpen_ && toSocket_.empty();
        ::pollfd watched[] = {
            {wantsInput ? ends_.input : -1, POLLIN, 0},
            {ends_.output, static_cast<short>(toOutput_.empty() ? 0 : POLLOUT), 0},
            {socketEvents != 0 ? ends_.socket : -1, socketEvents, 0},
            {ends_.ending, POLLIN, 0}};
        if (::poll(watched, std::size(watched), -1) < 0)
            continue;
        if (watched[3].revents != 0)
            return End::interrupted;
        if (!carry(watched[0].revents, watched[1].revents, watched[2].revents))
            return writeError_ == 0 || writeError_ == EPIPE ? End::unread : End::unwritable;
    }
    return End::hungUp;
}

// False when nobody takes the output.
bool Relay::carry(short input, short output, short socket) {
    if (input != 0)
        readInput();
    if ((socket & (POLLOUT | POLLERR | POLLHUP)) != 0)
        writeSocket();
    if ((socket & (POLLIN | POLLERR | POLLHUP)) != 0 && toOutput_.empty())
        readSocket();
    if ((output & (POLLERR | POLLNVAL)) != 0)
        return false;
    return (output & POLLOUT) == 0 || writeOutput();
}

void Relay::readInput() {
    std::array<char, largestStep> room;
    const ssize_t size = ::read(ends_.input, room.data(), room.size());
    if (size > 0)
        toSocket_.assign(room.data(), static_cast<std::size_t>(size));
    else if (size == 0 || !isForNow(errno))
        endInput();
}

void Relay::endInput() {
    inputOpen_ = false;
    toSocket_.clear();
    if (socketTakes_)
        ::shutdown(ends_.socket, SHUT_WR);
    socketTakes_ = false;
}

void Relay::writeSocket() {
    if (toSocket_.empty())
        return;
    const ssize_t size =
        ::send(ends_.socket, toSocket_.data(), toSocket_.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    if (size >= 0)
        toSocket_.erase(0, static_cast<std::size_t>(size));
    else if (!isForNow(errno))
        endInput(); // it may still have something to say
}

void Relay::readSocket() {
    std::array<char, largestStep> room;
    const ssize_t size = ::recv(ends_.socket, room.data(), room.size(), MSG_DONTWAIT);
    if (size > 0)
        toOutput_.assign(room.data(), static_cast<std::size_t>(size));
    else if (size == 0 || !isForNow(errno))
        socketSpeaks_ = false;
}

bool Relay::writeOutput() {
    const ssize_t size =
        ::write(ends_.output, toOutput_.data(), std::min(toOutput_.size(), largestWrite));
    if (size < 0) {
        writeError_ = isForNow(errno) ? 0 : errno;
        return writeError_ == 0;
    }
    toOutput_.erase(0, static_cast<std::size_t>(size));
    return true;
}

} // namespace zpctl
