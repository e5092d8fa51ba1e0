#include "Zephrin/ZPPlugInSocket.h"

#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <unistd.h>

namespace {

int descriptorNamed(std::string_view text) {
    int number = -1;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), number);
    const bool whole = result.ec == std::errc() && result.ptr == text.data() + text.size();
    return whole && number > STDERR_FILENO ? number : -1;
}

bool hasOption(int socket, int option, int wanted) {
    int value = -1;
    socklen_t size = sizeof(value);
    return ::getsockopt(socket, SOL_SOCKET, option, &value, &size) == 0 && value == wanted;
}

} // namespace

std::expected<platform::UniqueFd, int> ZPPlugInSocket::take() {
    const char* const text = std::getenv(variable);
    if (!text)
        return std::unexpected(ENOENT);
    const int number = descriptorNamed(text);
    ::unsetenv(variable);
    if (number < 0 || ::fcntl(number, F_GETFD) < 0)
        return std::unexpected(EBADF);
    if (!hasOption(number, SO_DOMAIN, AF_UNIX) || !hasOption(number, SO_TYPE, SOCK_STREAM))
        return std::unexpected(ENOTSOCK); // it is somebody else's: left as it is
    if (::fcntl(number, F_SETFD, FD_CLOEXEC) < 0)
        return std::unexpected(errno);
    return platform::UniqueFd(number);
}
