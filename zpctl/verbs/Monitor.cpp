// "monitor": a line for each annotation-change notification, until it is told to end.

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <memory>
#include <optional>
#include <ostream>
#include <poll.h>
#include <string>
#include <string_view>
#include <sys/eventfd.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "Zephrin/ZPNotificationObserver.h"
#include "platform/file/File.h"
#include "zpctl/EndingSignals.h"
#include "zpctl/Json.h"
#include "zpctl/Session.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using Clock = std::chrono::system_clock;

constexpr std::string_view notification = ZPNotificationObserver::annotationChange;

constexpr const char* explanation =
    R"(A line for each notification as it comes, with the time; changes shortly after each other may be
one. Says on standard error when it has begun. Needs no daemon: it may start later, end and start
again. Ends, with status 0, after --count notifications, when interrupted or told to terminate, and
when nobody reads its output any more.

Examples:
  zpctl monitor
  zpctl monitor --count 1 && zpctl match HXUserElection=1
  zpctl --json monitor | while read -r line; do zpctl tree; done

With --json: one {"time", "notification"} a line, the time in UTC.)";

std::string localTime(Clock::time_point time) {
    const auto milliseconds =
        std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count();
    const std::time_t seconds = milliseconds / 1000;
    std::tm parts{};
    ::localtime_r(&seconds, &parts);
    char text[40];
    const std::size_t size = std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts);
    std::snprintf(text + size, sizeof text - size, ".%03d", static_cast<int>(milliseconds % 1000));
    return text;
}

void writeLine(const Session& session) {
    const auto now = Clock::now();
    if (session.inJson()) {
        const std::chrono::duration<double> seconds = now.time_since_epoch();
        const nlohmann::ordered_json json{{"time", dateText({seconds.count()})},
                                          {"notification", notification}};
        session.out() << json.dump() << std::endl;
    } else {
        session.out() << localTime(now) << "  " << notification << std::endl;
    }
}

// Notifications as a count that a descriptor tells.
class Noticed {
public:
    Noticed()
        : count_(::eventfd(0, EFD_CLOEXEC)), observer_(notification, [this] {
              const std::uint64_t one = 1;
              (void)!::write(count_.get(), &one, sizeof one);
          }) {}

    [[nodiscard]] int descriptor() const { return count_.get(); }

    // How many since the last call. REQUIRES: the descriptor is readable.
    [[nodiscard]] std::uint64_t take() const {
        std::uint64_t count = 0;
        return ::read(count_.get(), &count, sizeof count) == sizeof count ? count : 0;
    }

private:
    const platform::UniqueFd count_;
    ZPNotificationObserver observer_;
};

// Without a count until something else ends it.
Status monitor(std::optional<std::uint64_t> left, const Session& session) {
    const EndingSignals signals;
    const Noticed noticed;
    session.note("waiting for notifications");
    ::pollfd watched[] = {{noticed.descriptor(), POLLIN, 0},
                          {signals.descriptor(), POLLIN, 0},
                          {session.outDescriptor(), 0, 0}}; // errors only: nobody reads any more
    while (session.out() && (!left || *left > 0)) {
        if (::poll(watched, std::size(watched), -1) < 0)
            continue;
        if (watched[1].revents != 0 || watched[2].revents != 0)
            break;
        for (std::uint64_t count = noticed.take(); count > 0 && left != 0; --count) {
            writeLine(session);
            if (left)
                --*left;
        }
    }
    return Status::done;
}

} // namespace

Action declareMonitor(CLI::App& command) {
    const auto count = std::make_shared<std::optional<std::uint64_t>>();
    command.add_option("--count", *count, "End after N notifications")
        ->type_name("N")
        ->check([](const std::string& text) {
            const bool none = text.find_first_not_of('0') == std::string::npos;
            return none || text.starts_with('-') ? "not above 0: " + text : std::string();
        });
    command.footer(explanation);
    return [count](Session& session) { return monitor(*count, session); };
}

} // namespace zpctl
