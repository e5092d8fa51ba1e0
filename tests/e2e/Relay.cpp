// relay SOCKET: sends what stands on standard input to the daemon, waits for one reply and writes
// it to standard output. A test copies it into an application to be that application's executable.

#include <cstdint>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace {

// True when all of it was read.
bool readAll(int fd, unsigned char* to, std::size_t size) {
    while (size > 0) {
        const ssize_t got = read(fd, to, size);
        if (got <= 0)
            return false;
        to += got;
        size -= static_cast<std::size_t>(got);
    }
    return true;
}

// Copies one frame to `out`, unless it is a greeting; answers its kind, 0 at the end.
int passFrame(int from, int out) {
    static unsigned char frame[1 << 20];
    if (!readAll(from, frame, 16))
        return 0;
    const std::uint32_t length = frame[0] | frame[1] << 8 | frame[2] << 16;
    if (16 + length > sizeof frame || !readAll(from, frame + 16, length))
        return 0;
    const int kind = frame[4];
    if (kind != 4 && write(out, frame, 16 + length) < 0)
        return 0;
    return kind;
}

} // namespace

int main(int count, char** arguments) {
    if (count != 2)
        return 2;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    for (unsigned i = 0; arguments[1][i] && i + 1 < sizeof address.sun_path; ++i)
        address.sun_path[i] = arguments[1][i];
    const int fd = socket(AF_UNIX, SOCK_STREAM, 0);
    if (connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0)
        return 3;
    if (passFrame(STDIN_FILENO, fd) == 0)
        return 4;
    int kind = 4;
    while (kind == 4)
        kind = passFrame(fd, STDOUT_FILENO);
    return kind == 3 ? 0 : 5;
}
