#include "zpctl/Relay.h"

#include <csignal>
#include <sys/socket.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/file/File.h"

namespace {

using platform::UniqueFd;
using zpctl::Relay;

struct Pair {
    explicit Pair(bool isPipe = true) {
        int ends[2];
        const int made = isPipe ? ::pipe(ends) : ::socketpair(AF_UNIX, SOCK_STREAM, 0, ends);
        EXPECT_EQ(made, 0);
        first.reset(ends[0]);
        second.reset(ends[1]);
    }

    UniqueFd first;
    UniqueFd second;
};

std::string allOf(const UniqueFd& from) {
    std::string all;
    char room[4096];
    for (ssize_t size = 0; (size = ::read(from.get(), room, sizeof room)) > 0;)
        all.append(room, static_cast<std::size_t>(size));
    return all;
}

class RelayTest : public testing::Test {
protected:
    [[nodiscard]] Relay::End run(int ending = -1) const {
        return Relay({input_.first.get(), output_.second.get(), socket_.first.get(), ending}).run();
    }

    Pair input_;
    Pair output_;
    Pair socket_{false};
};

TEST_F(RelayTest, CarriesMuchBothWaysUntilTheOtherSideHangsUp) {
    const std::string much(3UL << 20, 'x');
    std::string heard;
    std::jthread writer([&] {
        EXPECT_TRUE(platform::writeAll(input_.second.get(), much));
        input_.second.reset();
    });
    std::jthread other([&] { // says all before it listens; answers after the end
        EXPECT_TRUE(platform::writeAll(socket_.second.get(), much));
        EXPECT_EQ(allOf(socket_.second), much);
        EXPECT_TRUE(platform::writeAll(socket_.second.get(), "end"));
        socket_.second.reset();
    });
    std::jthread reader([&] { heard = allOf(output_.first); });
    EXPECT_EQ(run(), Relay::End::hungUp);
    output_.second.reset();
    reader.join();
    EXPECT_EQ(heard, much + "end");
}

TEST_F(RelayTest, EndsWithTheOtherSideWhateverTheInputDoes) {
    EXPECT_TRUE(platform::writeAll(socket_.second.get(), "last words"));
    EXPECT_TRUE(platform::writeAll(input_.second.get(), "unheard"));
    socket_.second.reset();
    EXPECT_EQ(run(), Relay::End::hungUp);
    output_.second.reset();
    EXPECT_EQ(allOf(output_.first), "last words");
}

TEST_F(RelayTest, EndsWhenInterruptedOrUnread) {
    const Pair ending;
    EXPECT_TRUE(platform::writeAll(ending.second.get(), "x"));
    EXPECT_EQ(run(ending.first.get()), Relay::End::interrupted);
    output_.first.reset();
    EXPECT_EQ(run(), Relay::End::unread);
}

} // namespace
