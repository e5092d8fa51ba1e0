#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace bench {

// One end of a conversation in which every request has the same bytes and every reply the same
// size. Blocking; the same code drives the daemon and the floor. Does not own the descriptor.
class Exchange {
public:
    Exchange(int fd, pid_t server, std::string request, std::size_t replySize);

    [[nodiscard]] pid_t server() const { return server_; }

    // Sends one request and reads its reply.
    std::chrono::nanoseconds roundTrip();
    // `count` requests with `window` of them in flight.
    std::chrono::nanoseconds windowed(std::size_t count, std::size_t window);

private:
    void sendAll(const char* bytes, std::size_t size) const;
    std::size_t readSome(std::size_t most);

    int fd_;
    pid_t server_;
    std::string request_;
    std::size_t replySize_;
    std::vector<char> buffer_;
};

// What was measured of one side: medians over the rounds.
struct Measured {
    double p50 = 0; // microseconds
    double p99 = 0;
    double processor = 0; // microseconds of the server's processor time, for each request
};

struct Compared {
    Measured daemon;
    Measured floor;
};

struct Plan {
    int rounds = 40;
    int perRound = 500;
};

// What is measured: something done once, which answers how long it took.
struct Side {
    std::function<std::chrono::nanoseconds()> once;
    pid_t server = 0; // whose processor time counts; 0 for nobody's
};

// Rounds on the one and the other in turn, so that what disturbs the machine disturbs both.
[[nodiscard]] Compared compare(const Side& daemon, const Side& floor, const Plan& plan);
[[nodiscard]] Compared compare(Exchange& daemon, Exchange& floor, const Plan& plan);

// Requests in a second, daemon and floor, with a window.
struct Rates {
    double daemon = 0;
    double floor = 0;
};

[[nodiscard]] Rates compareRates(Exchange& daemon, Exchange& floor, const Plan& plan,
                                 std::size_t window);

[[nodiscard]] double median(std::vector<double> values);

} // namespace bench
