#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <string_view>
#include <sys/uio.h>
#include <vector>

#include "platform/file/File.h"
#include "platform/value/SharedBytes.h"

namespace platform::ipc {

class CborEncoder;

// What a connection has to write. A frame is written at once as far as the socket takes it; the
// rest waits here, sharing the pieces that are encoded values, until the loop calls `flush`.
//
// Owned by a connection, which owns the descriptor too and calls `close` before it closes that.
// Any thread.
class Outbox {
public:
    enum class Outcome {
        done,    // all of it is written
        waiting, // some of it waits: for the socket to take more, or for `open`
        broken,  // the peer does not read any more, or the outbox is closed
    };

    // Nothing is written before; what was sent by then goes out with the next `flush`.
    void open(int descriptor);
    // Lets the socket take as much as `bytes` before it is full, as far as the system allows.
    void widen(int bytes);
    // After it returns the descriptor is not used any more. What waits is dropped.
    void close();

    using Descriptor = std::shared_ptr<const UniqueFd>;

    // Sends one frame: `text` with the cuts of `encoder` in it. A descriptor goes with its first
    // byte, and with no byte of another frame: so the reader knows to which it belongs.
    [[nodiscard]] Outcome send(std::string_view text, const CborEncoder& encoder,
                               const Descriptor& descriptor = {});
    // Writes on, once.
    [[nodiscard]] Outcome flush();

    // Between the two, frames that are not large are copied behind each other, to be written by one
    // call.
    void gather();
    [[nodiscard]] Outcome release();

    [[nodiscard]] bool empty() const noexcept { return !waiting_.load(std::memory_order_acquire); }

    // Bytes that were written ever.
    [[nodiscard]] std::uint64_t written() const noexcept {
        return written_.load(std::memory_order_relaxed);
    }

private:
    struct Piece {
        SharedBytes bytes;
        std::size_t offset = 0;
        Descriptor descriptor = {}; // until its first byte is written; the frame is one piece
    };

    [[nodiscard]] bool mayGather(const CborEncoder& encoder) const;
    [[nodiscard]] Outcome writeGathered();
    [[nodiscard]] Outcome sendWith(const Descriptor& descriptor, std::string_view text,
                                   const CborEncoder& encoder);
    void queue(std::string_view text, const CborEncoder& encoder, std::size_t skip);
    [[nodiscard]] std::vector<iovec> partsThatWait() const;
    [[nodiscard]] bool write(std::span<iovec> parts, std::size_t& count, int descriptor = -1);
    void drop(std::size_t count);
    Outcome settle();

    std::mutex mutex_;
    int descriptor_ = -1;
    bool closed_ = false;
    bool gathering_ = false;
    std::string gathered_; // empty whenever pieces wait
    std::deque<Piece> pieces_;
    std::atomic<bool> waiting_ = false;
    std::atomic<std::uint64_t> written_ = 0;
};

} // namespace platform::ipc
