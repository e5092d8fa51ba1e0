#include <array>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>
#include <vector>

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
    std::vector<std::pair<std::string, int>> cases;
    for (const char* text : {"", "0", "-1", "3x", " 3", "99999999999", "9999"})
        cases.emplace_back(text, EBADF);
    for (const UniqueFd* open : {&file, &datagrams})
        cases.emplace_back(std::to_string(open->get()), ENOTSOCK);
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
