#include "bench/Exchange.h"

#include <algorithm>
#include <functional>
#include <stdexcept>
#include <sys/socket.h>
#include <utility>

#include "bench/Cores.h"

namespace bench {

namespace {

using Clock = std::chrono::steady_clock;
using Microseconds = std::chrono::duration<double, std::micro>;

double percentile(std::vector<double>& sorted, double part) {
    return sorted[static_cast<std::size_t>(part * static_cast<double>(sorted.size() - 1))];
}

// The rounds of one side.
class Rounds {
public:
    Rounds(const Side& side, int perRound) : side_(side), perRound_(perRound) {}

    void round() {
        std::vector<double> times;
        const std::chrono::nanoseconds before = used();
        for (int i = 0; i < perRound_; ++i)
            times.push_back(Microseconds(side_.once()).count());
        const Microseconds used = this->used() - before;
        std::sort(times.begin(), times.end());
        p50_.push_back(percentile(times, 0.5));
        p99_.push_back(percentile(times, 0.99));
        processor_.push_back(used.count() / perRound_);
    }

    [[nodiscard]] Measured result() const {
        return {.p50 = median(p50_), .p99 = median(p99_), .processor = median(processor_)};
    }

private:
    [[nodiscard]] std::chrono::nanoseconds used() const {
        return side_.server > 0 ? processorTime(side_.server) : std::chrono::nanoseconds();
    }

    const Side& side_;
    int perRound_;
    std::vector<double> p50_;
    std::vector<double> p99_;
    std::vector<double> processor_;
};

} // namespace

Exchange::Exchange(int fd, pid_t server, std::string request, std::size_t replySize)
    : fd_(fd),
      server_(server),
      request_(std::move(request)),
      replySize_(replySize),
      buffer_(std::size_t{256} << 10) {}

void Exchange::sendAll(const char* bytes, std::size_t size) const {
    while (size > 0) {
        const ssize_t sent = send(fd_, bytes, size, MSG_NOSIGNAL);
        if (sent <= 0)
            throw std::runtime_error("the other side is gone");
        bytes += sent;
        size -= static_cast<std::size_t>(sent);
    }
}

std::size_t Exchange::readSome(std::size_t most) {
    const ssize_t got = recv(fd_, buffer_.data(), std::min(most, buffer_.size()), 0);
    if (got <= 0)
        throw std::runtime_error("the other side is gone");
    return static_cast<std::size_t>(got);
}

std::chrono::nanoseconds Exchange::roundTrip() {
    const Clock::time_point start = Clock::now();
    sendAll(request_.data(), request_.size());
    for (std::size_t left = replySize_; left > 0;)
        left -= readSome(left);
    return Clock::now() - start;
}

std::chrono::nanoseconds Exchange::windowed(std::size_t count, std::size_t window) {
    std::string many;
    for (std::size_t i = 0; i < window; ++i)
        many += request_;
    const Clock::time_point start = Clock::now();
    std::size_t sent = std::min(count, window);
    sendAll(many.data(), sent * request_.size());
    std::size_t bytes = 0;
    for (std::size_t answered = 0; answered < count;) {
        bytes += readSome(buffer_.size());
        const std::size_t now = bytes / replySize_;
        bytes %= replySize_;
        answered += now;
        const std::size_t next = std::min(now, count - sent);
        sendAll(many.data(), next * request_.size());
        sent += next;
    }
    return Clock::now() - start;
}

Compared compare(const Side& daemon, const Side& floor, const Plan& plan) {
    Rounds ours(daemon, plan.perRound);
    Rounds theirs(floor, plan.perRound);
    // Once for nothing: caches fill, and whatever is made at first use is made.
    Rounds(daemon, plan.perRound).round();
    Rounds(floor, plan.perRound).round();
    for (int i = 0; i < plan.rounds; ++i) {
        ours.round();
        theirs.round();
    }
    return {.daemon = ours.result(), .floor = theirs.result()};
}

Compared compare(Exchange& daemon, Exchange& floor, const Plan& plan) {
    const auto sideOf = [](Exchange& exchange) {
        return Side{.once = [&exchange] { return exchange.roundTrip(); },
                    .server = exchange.server()};
    };
    return compare(sideOf(daemon), sideOf(floor), plan);
}

Rates compareRates(Exchange& daemon, Exchange& floor, const Plan& plan, std::size_t window) {
    const auto count = static_cast<std::size_t>(plan.perRound) * 4;
    const auto rate = [&](Exchange& side) {
        const std::chrono::duration<double> took = side.windowed(count, window);
        return static_cast<double>(count) / took.count();
    };
    std::vector<double> ours;
    std::vector<double> theirs;
    rate(daemon);
    for (int i = 0; i < plan.rounds; ++i) {
        ours.push_back(rate(daemon));
        theirs.push_back(rate(floor));
    }
    return {.daemon = median(ours), .floor = median(theirs)};
}

double median(std::vector<double> values) {
    if (values.empty())
        return 0;
    std::sort(values.begin(), values.end());
    return values[values.size() / 2];
}

} // namespace bench
