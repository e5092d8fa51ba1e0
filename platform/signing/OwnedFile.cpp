#include "platform/signing/OwnedFile.h"

#include <cerrno>
#include <fcntl.h>
#include <system_error>

namespace platform {

namespace {

std::unexpected<std::string> failure(int number, const std::string& path) {
    return std::unexpected(path + ": " + std::generic_category().message(number));
}

} // namespace

std::expected<OwnedFile, std::string> OwnedFile::open(std::string path, OwnershipTest& ownership) {
    if (auto refusal = ownership.refusal(path))
        return std::unexpected(std::move(*refusal));
    struct ::stat status = {};
    UniqueFd file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (!file || ::fstat(file.get(), &status) != 0)
        return failure(errno, path);
    if (!S_ISREG(status.st_mode))
        return std::unexpected(path + " is not a regular file");
    if (auto refusal = OwnershipTest::refusalOf(status, path))
        return std::unexpected(std::move(*refusal));
    return OwnedFile{std::move(path), std::move(file), status};
}

} // namespace platform
