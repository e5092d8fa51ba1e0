#include "platform/log/Writer.h"

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <pthread.h>
#include <system_error>
#include <thread>

namespace platform::log {

namespace {

// Lines are gathered for this long or up to this size, whichever is first.
constexpr auto gatherTime = std::chrono::milliseconds(10);
constexpr std::size_t gatheredSize = 256 * 1024;
// How long the end of the process waits for a reader of standard error that does not read.
constexpr auto flushPatience = std::chrono::seconds(2);
// Room that is kept between batches; what a burst needed beyond it is given back.
constexpr std::size_t keptCapacity = 64 * 1024;

constexpr std::string_view cutMark = " [cut]";

// Stands before each text in the buffer.
struct Header {
    std::int64_t time;
    const char* category;
    std::uint32_t length;
    Level level;
};

// While it lives the calling thread takes no signals, and threads that it starts never do: signals
// are the main loop's business, and a closed standard error must not end the daemon.
class SignalsBlocked {
public:
    SignalsBlocked() {
        sigset_t all;
        ::sigfillset(&all);
        ::pthread_sigmask(SIG_SETMASK, &all, &before_);
    }

    SignalsBlocked(const SignalsBlocked&) = delete;
    SignalsBlocked& operator=(const SignalsBlocked&) = delete;

    ~SignalsBlocked() { ::pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

private:
    sigset_t before_;
};

std::string_view cut(std::string_view text, std::size_t length) {
    // Not in the middle of a character.
    while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xc0) == 0x80)
        --length;
    return text.substr(0, length);
}

} // namespace

Writer& Writer::shared() {
    static Writer* const writer = new Writer;
    return *writer;
}

void Writer::append(Level level, const char* category, std::int64_t time, std::string_view text) {
    bool wakes = false;
    {
        const std::lock_guard lock(mutex_);
        startThread();
        const std::size_t limit = level < Level::standard ? crowdedSize : bufferSize;
        const std::size_t size = std::min(text.size(), longestLine) + sizeof(Header);
        if (pending_.size() + size > limit) {
            ++dropped_;
            return;
        }
        store(level, category, time, text);
        const bool hurry = !urgent_ && (level == Level::error || pending_.size() > gatheredSize);
        urgent_ = urgent_ || hurry;
        wakes = idle_ || hurry;
        idle_ = false;
    }
    if (wakes)
        wake_.notify_one();
}

// REQUIRES: mutex held, room for the line
void Writer::store(Level level, const char* category, std::int64_t time, std::string_view text) {
    const std::size_t before = pending_.size();
    const bool tooLong = text.size() > longestLine;
    if (tooLong)
        text = cut(text, longestLine - cutMark.size());
    const std::size_t length = text.size() + (tooLong ? cutMark.size() : 0);
    const Header header{time, category, static_cast<std::uint32_t>(length), level};
    pending_.append(reinterpret_cast<const char*>(&header), sizeof header);
    pending_.append(text);
    if (tooLong)
        pending_.append(cutMark);
    appended_ += pending_.size() - before;
}

// REQUIRES: mutex held
void Writer::startThread() {
    if (started_)
        return;
    const SignalsBlocked blocked;
    try {
        std::thread([this] {
            ::pthread_setname_np(::pthread_self(), "log");
            run();
        }).detach();
    } catch (const std::system_error&) {
        return; // no thread to be had now; the next line tries again
    }
    started_ = true;
    std::atexit([] { shared().flush(); });
}

void Writer::run() {
    const auto sink = makeSinkForThisProcess();
    std::string batch;
    std::unique_lock lock(mutex_);
    for (;;) {
        idle_ = pending_.empty();
        wake_.wait(lock, [this] { return !pending_.empty(); });
        idle_ = false;
        wake_.wait_for(lock, gatherTime, [this] { return urgent_; });
        urgent_ = false;
        batch.swap(pending_);
        const std::uint64_t dropped = std::exchange(dropped_, 0);
        const std::uint64_t end = appended_;
        lock.unlock();

        hand(batch, *sink);
        reportDropped(dropped, *sink);
        sink->finish();
        batch.clear();
        if (batch.capacity() > keptCapacity)
            batch = std::string();

        lock.lock();
        written_ = end;
        out_.notify_all();
    }
}

void Writer::hand(std::string_view batch, Sink& sink) {
    while (!batch.empty()) {
        Header header = {};
        std::memcpy(&header, batch.data(), sizeof header);
        batch.remove_prefix(sizeof header);
        sink.add({header.level, header.category, header.time, batch.substr(0, header.length)});
        batch.remove_prefix(header.length);
    }
}

void Writer::reportDropped(std::uint64_t count, Sink& sink) {
    if (count == 0)
        return;
    struct ::timespec now = {};
    ::clock_gettime(CLOCK_REALTIME, &now);
    const std::string text = "log buffer full: " + std::to_string(count) + " lines dropped";
    sink.add({Level::error, defaultLog().name(), now.tv_sec * 1'000'000'000 + now.tv_nsec, text});
}

void Writer::flush() {
    std::unique_lock lock(mutex_);
    if (!started_)
        return;
    const std::uint64_t target = appended_;
    urgent_ = !pending_.empty();
    wake_.notify_one();
    out_.wait_for(lock, flushPatience, [&] { return written_ >= target; });
}

} // namespace platform::log
