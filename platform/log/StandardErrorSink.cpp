#include <cerrno>
#include <ctime>
#include <poll.h>
#include <string>
#include <unistd.h>

#include "platform/log/Sink.h"

namespace platform::log {

namespace {

constexpr std::int64_t nanosecondsPerSecond = 1'000'000'000;
constexpr std::int64_t nanosecondsPerMillisecond = 1'000'000;
// A batch is written in pieces of about this size.
constexpr std::size_t pieceSize = 64 * 1024;

class StandardErrorSink final : public Sink {
public:
    StandardErrorSink() {
        source_ = " ";
        source_ += program_invocation_short_name;
        source_ += '[' + std::to_string(::getpid()) + "] ";
    }

    void add(const Line& line) override {
        appendTime(line.time);
        text_ += source_;
        text_ += line.category;
        text_ += ' ';
        text_ += levelName(line.level);
        text_ += ": ";
        text_ += line.text;
        text_ += '\n';
        if (text_.size() >= pieceSize)
            finish();
    }

    void finish() override {
        writeOut(text_);
        text_.clear();
    }

private:
    void appendTime(std::int64_t time) {
        const std::time_t second = time / nanosecondsPerSecond;
        if (second != shownSecond_) {
            shownSecond_ = second;
            struct ::tm parts = {};
            ::gmtime_r(&second, &parts);
            const auto size = std::strftime(secondText_, sizeof secondText_, "%FT%T", &parts);
            secondText_[size] = '\0';
        }
        const auto milliseconds =
            static_cast<int>(time % nanosecondsPerSecond / nanosecondsPerMillisecond);
        const auto digit = [](int number) { return static_cast<char>('0' + number % 10); };
        const char fraction[] = {'.', digit(milliseconds / 100), digit(milliseconds / 10),
                                 digit(milliseconds), 'Z'};
        text_ += secondText_;
        text_.append(fraction, sizeof fraction);
    }

    // Waits for a slow reader. What cannot be written at all is gone: there is nowhere to tell.
    static void writeOut(std::string_view text) {
        while (!text.empty()) {
            const ssize_t written = ::write(STDERR_FILENO, text.data(), text.size());
            if (written >= 0) {
                text.remove_prefix(static_cast<std::size_t>(written));
            } else if (errno == EAGAIN) {
                struct ::pollfd ready = {STDERR_FILENO, POLLOUT, 0};
                ::poll(&ready, 1, -1);
            } else if (errno != EINTR) {
                return;
            }
        }
    }

    std::string source_; // " zpd[pid] "
    std::string text_;
    std::time_t shownSecond_ = -1;
    char secondText_[32] = "";
};

} // namespace

std::unique_ptr<Sink> makeStandardErrorSink() {
    return std::make_unique<StandardErrorSink>();
}

} // namespace platform::log
