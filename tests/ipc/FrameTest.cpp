#include "platform/ipc/Frame.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "tests/ipc/Harness.h"

namespace {

using namespace platform::ipc;
using namespace tests;

// Feeds a reader in steps of given sizes and collects the bodies that come out.
class Feed {
public:
    explicit Feed(FrameReader::Side side = FrameReader::Side::daemon) : reader_(side) {}

    void bytes(std::string_view stream, bool isFromPeer = true) {
        while (!stream.empty() && complaint.empty()) {
            const auto room = reader_.room(scratch_.data(), scratch_.size());
            std::size_t count = 0;
            for (const iovec& part : room) {
                const std::size_t n = std::min(part.iov_len, stream.size());
                stream.copy(static_cast<char*>(part.iov_base), n);
                stream.remove_prefix(n);
                count += n;
            }
            reader_.filled(count, isFromPeer);
            take();
        }
    }

    std::vector<std::string> bodies;
    std::vector<bool> fromPeer;
    std::string complaint;

private:
    void take() {
        for (;;) {
            const auto frame = reader_.next();
            if (!frame) {
                complaint = frame.error();
                return;
            }
            if (!*frame)
                break;
            bodies.emplace_back((*frame)->body);
            fromPeer.push_back((*frame)->fromPeer);
        }
        reader_.keep();
    }

    FrameReader reader_;
    std::string scratch_ = std::string(100, '\0');
};

TEST(FrameReaderTest, CutsTheSameFramesHoweverTheyArrive) {
    const std::vector<std::string> bodies = {
        "", "a", std::string(50, 'b'), std::string(5000, 'c'), "", std::string(99, 'd')};
    std::string stream;
    for (const std::string& body : bodies)
        stream += frame(1, 7, body);
    for (std::size_t step = 1; step < 300; ++step) {
        Feed feed;
        for (std::size_t at = 0; at < stream.size(); at += step)
            feed.bytes(std::string_view(stream).substr(at, step));
        ASSERT_EQ(feed.bodies, bodies) << step;
    }
}

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
        EXPECT_EQ(feed.fromPeer, (std::vector<bool>{true, false, true, false})) << cut;
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
