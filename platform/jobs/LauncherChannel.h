#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/file/File.h"
#include "platform/ipc/Frame.h"
#include "platform/ipc/SocketWatch.h"
#include "platform/value/Value.h"

namespace platform::launcher {

// One end of the socket between daemon and launcher: whole frames both ways, and descriptors with
// them, each frame's with its first byte. Neither reading nor writing ever waits.
//
// Shared by its owner and the loop's waits; `close` ends the waits, and after it no handler is
// called. Used on the loop only.
class LauncherChannel final : public ipc::SocketWatch::Target,
                              public std::enable_shared_from_this<LauncherChannel> {
public:
    // What came with the messages so far and was not taken yet, in its order.
    using Descriptors = std::deque<UniqueFd>;

    struct Handlers {
        // False when the message is none that may come: then the channel is lost.
        std::function<bool(const Dictionary&, Descriptors&)> message;
        // Everything is written that waited.
        std::function<void()> drained;
        // End of file, or a fixed text for the log that says what is wrong. Called once.
        std::function<void(const char* fault)> lost;
    };

    enum class Reading : std::uint8_t {
        always,
        whileNothingWaits, // to be written: so what waits has a bound
    };

    // REQUIRES: on the loop, or the loop not running.
    LauncherChannel(ipc::Loop& loop, UniqueFd socket, Reading reading);

    void start(Handlers handlers);
    // False when the message is too large for the wire; it is not sent then.
    [[nodiscard]] bool send(const Dictionary& message, std::vector<UniqueFd> descriptors = {});
    // Takes what the peer wrote before it ended, and is lost. The peer cannot write any more.
    void finish();
    void close();

    [[nodiscard]] bool isWaiting() const noexcept { return !waiting_.empty(); }

private:
    struct Outgoing {
        std::string bytes;
        std::size_t written = 0;
        std::vector<UniqueFd> descriptors; // until the first byte is written
    };

    void readable() override;
    void writable() override;
    [[nodiscard]] bool mayRead() const;
    [[nodiscard]] bool readOnce();
    void takeFrames();
    [[nodiscard]] bool take(const ipc::Frame& frame);
    void waitForMore();
    void writeWaiting();
    void lose(const char* fault);

    const Reading reading_;
    ipc::SocketWatch socket_;
    ipc::FrameReader reader_{ipc::FrameReader::Side::daemon};
    Handlers handlers_;
    Descriptors arrived_;
    std::deque<Outgoing> waiting_;
    bool broken_ = false; // nobody reads any more what is written
    bool over_ = false;
};

} // namespace platform::launcher
