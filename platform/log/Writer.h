#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <string_view>

#include "platform/log/Log.h"
#include "platform/log/Sink.h"

namespace platform::log {

// The way from any thread to the sink: a bounded buffer that callers append to without ever
// waiting for the sink, and one thread that empties it. There is one for the process; it is never
// destroyed, since lines may be written until the very end. The thread starts with the first
// line, sleeps while there is nothing, then gathers lines for a moment and writes them together;
// an error line wakes it at once. (Programs of this system spawn and never just fork: a forked
// child would have no writer thread.)
class Writer {
public:
    // Of the buffered lines, with what stands before each.
    static constexpr std::size_t bufferSize = 1024 * 1024;
    // Debug and info lines are dropped from here on, so that the others still find room.
    static constexpr std::size_t crowdedSize = bufferSize / 4 * 3;
    // A longer line is cut.
    static constexpr std::size_t longestLine = 64 * 1024;

    [[nodiscard]] static Writer& shared();

    void append(Level level, const char* category, std::int64_t time, std::string_view text);
    void flush();

private:
    Writer() = default;

    void startThread();
    void run();
    void store(Level level, const char* category, std::int64_t time, std::string_view text);
    static void hand(std::string_view batch, Sink& sink);
    static void reportDropped(std::uint64_t count, Sink& sink);

    std::mutex mutex_;
    std::condition_variable wake_;
    std::condition_variable out_;
    std::string pending_; // headers and texts, one after the other
    std::uint64_t dropped_ = 0;
    std::uint64_t appended_ = 0; // bytes ever
    std::uint64_t written_ = 0;  // bytes ever
    bool started_ = false;
    bool idle_ = false;   // the thread waits for a first line
    bool urgent_ = false; // the thread shall not gather further
};

} // namespace platform::log
