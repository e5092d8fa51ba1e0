#include <array>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "Zephrin/ZPPlugInSocket.h"

namespace {

using platform::UniqueFd;

UniqueFd half(int type) {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, type, 0, ends.data()), 0);
    ::close(ends[1]);
    return UniqueFd(ends[0]);
}

TEST(PlugInSocketTest, TakesWhatIsASocketOnce) {
    UniqueFd given = half(SOCK_STREAM);
    ::setenv(ZPPlugInSocket::variable, std::to_string(given.get()).c_str(), 1);
    const auto taken = ZPPlugInSocket::take();
    ASSERT_TRUE(taken);
    EXPECT_EQ(taken->get(), given.release());
    EXPECT_TRUE(::fcntl(taken->get(), F_GETFD) & FD_CLOEXEC);
    EXPECT_EQ(ZPPlugInSocket::take().error(), ENOENT);
}

TEST(PlugInSocketTest, LeavesAnythingElseAlone) {
    const UniqueFd file(::open("/dev/null", O_RDONLY));
    const UniqueFd datagrams = half(SOCK_DGRAM);
    const std::string number = std::to_string(half(SOCK_STREAM).get()); // closed by now
    const std::pair<std::string, int> cases[] = {{"", EBADF},
                                                 {"0", EBADF},
                                                 {"-1", EBADF},
                                                 {"3x", EBADF},
                                                 {" 3", EBADF},
                                                 {"99999999999", EBADF},
                                                 {number, EBADF},
                                                 {std::to_string(file.get()), ENOTSOCK},
                                                 {std::to_string(datagrams.get()), ENOTSOCK}};
    for (const auto& [text, error] : cases) {
        ::setenv(ZPPlugInSocket::variable, text.c_str(), 1);
        const auto taken = ZPPlugInSocket::take();
        EXPECT_EQ(taken ? 0 : taken.error(), error) << text;
        EXPECT_EQ(::getenv(ZPPlugInSocket::variable), nullptr) << text;
    }
    EXPECT_GE(::fcntl(file.get(), F_GETFD), 0);
    EXPECT_GE(::fcntl(datagrams.get(), F_GETFD), 0);
}

} // namespace
