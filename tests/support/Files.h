#pragma once

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

// What tests do to files. Failing is an exception, that ends the test.

inline std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// 0 when there is nothing.
inline ::mode_t modeOf(const std::string& path) {
    struct ::stat status = {};
    return ::stat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

inline void setMode(const std::string& path, ::mode_t mode) {
    std::filesystem::permissions(path, std::filesystem::perms(mode));
}

// In place of what is there.
inline void makeFifo(const std::string& path) {
    std::filesystem::remove(path);
    if (::mkfifo(path.c_str(), 0644) != 0)
        throw std::runtime_error("mkfifo " + path);
}

// To a user that is nobody else here; a link itself. Only root can.
inline void giveAway(const std::string& path, ::uid_t to = 12345) {
    if (::lchown(path.c_str(), to, to) != 0)
        throw std::runtime_error("chown " + path);
}

// The umask for as long as it lives.
class Umask {
public:
    explicit Umask(::mode_t mask) : before_(::umask(mask)) {}

    ~Umask() { ::umask(before_); }

private:
    ::mode_t before_;
};
