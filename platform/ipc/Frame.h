#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <expected>
#include <memory>
#include <optional>
#include <string_view>
#include <sys/uio.h>
#include <vector>

namespace platform::ipc {

// One message is one frame: a header of 16 bytes, little-endian, and a body of one CBOR map.
// docs/wire-format.md describes it in full.

inline constexpr std::size_t frameHeaderSize = 16;
inline constexpr std::uint8_t wireVersion = 1;
inline constexpr std::uint32_t largestRequestBody = 16U << 20;
inline constexpr std::size_t mostRequestValues = 262'144;
inline constexpr std::uint32_t largestReplyBody = 256U << 20;
inline constexpr std::uint32_t largestGreetingBody = 64;
inline constexpr std::size_t challengeSize = 16;

enum class FrameKind : std::uint8_t {
    request = 1, // expects a reply
    oneWay = 2,
    reply = 3,
    greeting = 4, // daemon to client, the first frame of a connection: {"challenge": 16 bytes}
    greetingAnswer = 5,
};

struct FrameHeader {
    std::uint32_t bodySize = 0;
    FrameKind kind = FrameKind::request;
    std::uint64_t messageId = 0;

    using Bytes = std::array<char, frameHeaderSize>;
    [[nodiscard]] Bytes bytes() const;
};

struct Frame {
    FrameHeader header;
    std::string_view body; // in the reader's storage, until its next call
    bool fromPeer = true;  // every byte of it came with the flag of that name
    bool isMixed = false;  // some did, and some did not
};

// Cuts a stream of bytes into frames. Keeps only what belongs to frames that are not complete yet,
// and room for that only as it arrives. The owner reads from its descriptor into the two parts of
// `room`, tells by `filled` how much came, takes frames by `next` until there is none, and then
// calls `keep`, after which the scratch memory may be used for something else.
//
// Owned by a connection; used on its loop only.
class FrameReader {
public:
    // Which end of the connection reads: it decides which kinds and sizes are well-formed.
    enum class Side : std::uint8_t { daemon, client };

    explicit FrameReader(Side side) : side_(side) {}

    // Where the next bytes go: first the rest of a started frame, then `scratch`.
    [[nodiscard]] std::array<iovec, 2> room(char* scratch, std::size_t size);
    void filled(std::size_t count, bool fromPeer = true);

    // The next complete frame, or nothing yet, or what is malformed about the stream (a fixed
    // text for the log; nothing more may be read then).
    [[nodiscard]] std::expected<std::optional<Frame>, const char*> next();
    void keep();

    // The whole size of the frame that was begun, once its head is there; else 0. After `keep`.
    [[nodiscard]] std::size_t begunFrame() const noexcept;

private:
    struct Free {
        void operator()(char* p) const noexcept;
    };

    [[nodiscard]] std::size_t heldSize() const noexcept { return heldEnd_ - heldBegin_; }

    [[nodiscard]] std::expected<std::optional<FrameHeader>, const char*>
    headerOf(std::string_view bytes) const;
    [[nodiscard]] std::size_t missingOfHeld() const;
    void reserve(std::size_t more);
    void hold(std::string_view bytes);
    void noteHeld(std::size_t count, bool fromPeer);
    void attribute(Frame& frame, std::size_t size);
    [[nodiscard]] std::expected<std::optional<Frame>, const char*> nextHeld();
    [[nodiscard]] std::expected<std::optional<Frame>, const char*> nextFresh();

    const Side side_;
    std::unique_ptr<char[], Free> held_;
    std::size_t heldCapacity_ = 0;
    std::size_t heldBegin_ = 0;
    std::size_t heldEnd_ = 0;

    // Whose the held bytes are, in their order; neighbours differ.
    struct Run {
        std::size_t size;
        bool fromPeer;
    };

    std::vector<Run> heldRuns_;
    const char* scratch_ = nullptr;
    std::size_t roomOfHeld_ = 0;
    std::string_view fresh_; // in the scratch memory
    bool freshFromPeer_ = true;
};

} // namespace platform::ipc
