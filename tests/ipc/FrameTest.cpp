#include "platform/ipc/Frame.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "tests/ipc/Feed.h"
#include "tests/ipc/Harness.h"

namespace {

using namespace platform::ipc;
using namespace tests;

TEST(FrameReaderTest, AFrameIsFromThePeerOnlyWhenAllOfItIs) {
    const std::string one = frame(1, 1, std::string(300, 'x'));
    for (const std::size_t cut : {1U, 15U, 16U, 17U, 200U, 315U}) {
        Feed feed;
        feed.bytes(one);
        feed.bytes(one.substr(0, cut));
        feed.bytes(one.substr(cut), false);
        feed.bytes(one);
        feed.bytes(one.substr(0, cut), false);
        feed.bytes(one.substr(cut));
        feed.bytes(one, false);
        EXPECT_EQ(feed.fromPeer, (std::vector<bool>{true, false, true, false, false})) << cut;
        EXPECT_EQ(feed.isMixed, (std::vector<bool>{false, true, false, true, false})) << cut;
    }
}

TEST(FrameReaderTest, TakesFramesOfUpTo16MiBFromTheOtherSideOnly) {
    Feed daemon;
    daemon.bytes(std::string("\0\0\0\1", 4) + frame(1, 1, "").substr(4)); // exactly 16 MiB
    EXPECT_EQ(daemon.complaint, "");
    Feed client(FrameReader::Side::client);
    client.bytes(frame(1, 1, ""));
    EXPECT_NE(client.complaint, "");
}

} // namespace
