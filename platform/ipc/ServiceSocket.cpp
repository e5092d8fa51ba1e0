#include "platform/ipc/ServiceSocket.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <optional>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>
#include <utility>

#include "platform/ipc/Listener.h"

namespace platform::ipc {

namespace {

constexpr unsigned folderMode = 0755;
constexpr unsigned socketMode = 0666;
constexpr unsigned lockMode = 0600;
constexpr int backlog = 1024; // connections that wait to be accepted

// Whether a socket takes descriptors (kernel 6.16); the system's headers may be older.
constexpr int passRights = 83;

// How long a client waits for a daemon that has too many new connections to accept.
constexpr timeval longestConnect{.tv_sec = 10, .tv_usec = 0};

std::expected<sockaddr_un, Error> addressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    static_assert(longestSocketPath < sizeof(address.sun_path));
    if (path.size() > longestSocketPath)
        return std::unexpected(posixError(ENAMETOOLONG, "socket path " + path));
    if (path.empty() || path.find('\0') != std::string::npos)
        return std::unexpected(posixError(EINVAL, "socket path " + path));
    std::memcpy(address.sun_path, path.data(), path.size());
    return address;
}

// Makes the folder for everybody to pass through, whatever the umask; leaves one that is there.
std::optional<Error> makeFolder(const std::string& folder) {
    if (::access(folder.c_str(), F_OK) == 0)
        return std::nullopt;
    if (auto error = makeFolders(folder, folderMode))
        return error;
    if (::chmod(folder.c_str(), folderMode) != 0)
        return posixError(errno, "chmod " + folder);
    return std::nullopt;
}

std::expected<UniqueFd, Error> lockBeside(const std::string& path) {
    const std::string lockPath = path + ".lock";
    UniqueFd lock(::open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, lockMode));
    if (!lock)
        return std::unexpected(posixError(errno, "open " + lockPath));
    if (::flock(lock.get(), LOCK_EX | LOCK_NB) == 0)
        return lock;
    if (errno == EWOULDBLOCK)
        return std::unexpected(posixError(EADDRINUSE, "another process serves " + path));
    return std::unexpected(posixError(errno, "lock " + lockPath));
}

UniqueFd newSocket(int flags) {
    return UniqueFd(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | flags, 0));
}

// Takes away a socket that a daemon left. Anything else at the path is left alone.
std::optional<Error> removeStale(const std::string& path) {
    struct stat status{};
    if (::lstat(path.c_str(), &status) != 0 || !S_ISSOCK(status.st_mode))
        return std::nullopt;
    if (::unlink(path.c_str()) != 0 && errno != ENOENT)
        return posixError(errno, "remove " + path);
    return std::nullopt;
}

// Beside the path, and not longer than it: what has no hidden name is bound at once.
std::string hiddenPath(std::string path) {
    const std::size_t name = path.rfind('/') + 1; // npos + 1 is the first letter
    if (path.size() > name + 2)
        path[name] = '.';
    return path;
}

// A socket that clients can connect to at the path.
std::expected<UniqueFd, Error> listeningAt(const std::string& path) {
    const auto address = addressOf(path);
    if (!address)
        return std::unexpected(address.error());
    if (auto error = removeStale(path))
        return std::unexpected(std::move(*error));
    UniqueFd socket = newSocket(SOCK_NONBLOCK);
    if (!socket)
        return std::unexpected(posixError(errno, "socket"));
    // Accepted sockets inherit these; so the writer of each byte is known from the first on.
    const int on = 1;
    if (::setsockopt(socket.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof(on)) != 0)
        return std::unexpected(posixError(errno, "SO_PASSCRED"));
    (void)takeNoDescriptors(socket.get()); // else there is the wait breaker
    if (::bind(socket.get(), reinterpret_cast<const sockaddr*>(&*address), sizeof(*address)) != 0)
        return std::unexpected(posixError(errno, "bind " + path));
    if (::chmod(path.c_str(), socketMode) != 0)
        return std::unexpected(posixError(errno, "chmod " + path));
    if (::listen(socket.get(), backlog) != 0)
        return std::unexpected(posixError(errno, "listen " + path));
    return socket;
}

// Renames the socket to where clients look for it; one that a daemon left there goes. Anything else
// stays.
std::optional<Error> show(const std::string& hidden, const std::string& path) {
    if (auto error = removeStale(path))
        return error;
    if (::renameat2(AT_FDCWD, hidden.c_str(), AT_FDCWD, path.c_str(), RENAME_NOREPLACE) == 0)
        return std::nullopt;
    const int number = errno;
    ::unlink(hidden.c_str());
    return posixError(number, "bind " + path);
}

} // namespace

std::expected<ServiceSocket, Error> ServiceSocket::bind(const std::string& path) {
    if (const auto address = addressOf(path); !address)
        return std::unexpected(address.error());
    if (auto error = makeFolder(folderOf(path)))
        return std::unexpected(std::move(*error));
    auto lock = lockBeside(path);
    if (!lock)
        return std::unexpected(std::move(lock).error());
    const std::string hidden = hiddenPath(path);
    auto socket = listeningAt(hidden);
    if (!socket)
        return std::unexpected(std::move(socket).error());
    if (auto error = hidden == path ? std::nullopt : show(hidden, path))
        return std::unexpected(std::move(*error));
    return ServiceSocket(path, std::move(*lock), std::move(*socket));
}

ServiceSocket::~ServiceSocket() {
    if (lock_)
        ::unlink(path_.c_str());
}

// What clients send nobody wants, and whoever drops the last reference to it may have to wait: for
// as long as a lingering TCP socket says.
bool takeNoDescriptors(int socket) noexcept {
    const int off = 0;
    return ::setsockopt(socket, SOL_SOCKET, passRights, &off, sizeof(off)) == 0;
}

std::expected<UniqueFd, Error> connectToService(const std::string& path) {
    const auto address = addressOf(path);
    if (!address)
        return std::unexpected(address.error());
    UniqueFd socket = newSocket(0);
    if (!socket)
        return std::unexpected(posixError(errno, "socket"));
    ::setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &longestConnect, sizeof(longestConnect));
    int result = 0;
    do {
        result =
            ::connect(socket.get(), reinterpret_cast<const sockaddr*>(&*address), sizeof(*address));
    } while (result != 0 && errno == EINTR);
    if (result != 0)
        return std::unexpected(posixError(errno, "connect " + path));
    if (::fcntl(socket.get(), F_SETFL, O_NONBLOCK) != 0)
        return std::unexpected(posixError(errno, "connect " + path));
    return socket;
}

} // namespace platform::ipc
