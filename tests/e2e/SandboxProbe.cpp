// sandbox_probe: uses a sandbox extension through the client library. Takes commands from standard
// input, one a line, and answers each with one line: what it read, or the name of an errno value.

#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <expected>
#include <fcntl.h>
#include <iostream>
#include <linux/landlock.h>
#include <memory>
#include <sched.h>
#include <set>
#include <string>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "Zephrin/ZPSandboxExtension.h"

namespace {

std::string nameOf(int error) {
    return strerrorname_np(error);
}

std::string contentOf(int file) {
    char room[4096];
    const ssize_t size = ::pread(file, room, sizeof room, 0);
    return size < 0 ? nameOf(errno) : std::string(room, static_cast<std::size_t>(size));
}

std::string namesIn(int folder) {
    DIR* const stream = ::fdopendir(::fcntl(folder, F_DUPFD_CLOEXEC, 0));
    if (!stream)
        return nameOf(errno);
    std::set<std::string> names;
    while (const dirent* const entry = ::readdir(stream))
        names.insert(entry->d_name);
    ::closedir(stream);
    std::string line;
    for (const std::string& name : names)
        line += name + " ";
    return line;
}

// From here on this process can open nothing by itself.
std::string confine() {
    landlock_ruleset_attr nothing{};
    nothing.handled_access_fs = LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR;
    const int rules = static_cast<int>(
        ::syscall(SYS_landlock_create_ruleset, &nothing, sizeof nothing.handled_access_fs, 0));
    const bool done = rules >= 0 && ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
                      ::syscall(SYS_landlock_restrict_self, rules, 0) == 0;
    return done ? "confined" : nameOf(errno);
}

std::string tryAlone(const std::string& path) {
    const platform::UniqueFd file(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    return file ? contentOf(file.get()) : nameOf(errno);
}

std::unique_ptr<ZPSandboxExtension> extension;

std::string consume(const std::string& token) {
    extension = std::make_unique<ZPSandboxExtension>(token);
    extension->consume();
    return extension->handle() < 0 ? "nothing" : "consumed";
}

std::string openBelow(const std::string& path) {
    const auto file = extension->open(path);
    return file ? contentOf(file->get()) : nameOf(file.error());
}

std::string answer(const std::string& command, const std::string& argument) {
    if (command == "confine")
        return confine();
    if (command == "unshare")
        return ::unshare(CLONE_NEWNS) == 0 ? "unshared" : nameOf(errno);
    if (command == "try")
        return tryAlone(argument);
    if (command == "consume")
        return consume(argument);
    if (command == "list")
        return namesIn(static_cast<int>(extension->handle()));
    if (command == "open")
        return openBelow(argument);
    extension->expel();
    return std::to_string(extension->handle());
}

} // namespace

int main() {
    for (std::string line; std::getline(std::cin, line);) {
        const auto space = std::min(line.find(' '), line.size());
        std::cout << answer(line.substr(0, space), line.substr(std::min(space + 1, line.size())))
                  << std::endl;
    }
    return 0;
}
