#include "zpctl/Session.h"

#include <ostream>
#include <poll.h>

#include <nlohmann/json.hpp>

#include "zpctl/Json.h"
#include "zpctl/Printable.h"

namespace zpctl {

bool Terminal::readerIsGone() const {
    ::pollfd watched = {descriptor, 0, 0};
    return ::poll(&watched, 1, 0) > 0;
}

std::chrono::milliseconds Session::timeout() const {
    const std::chrono::duration<double> seconds(options_.timeout);
    return std::chrono::duration_cast<std::chrono::milliseconds>(seconds);
}

Daemon& Session::daemon() {
    if (!daemon_)
        daemon_ = std::make_unique<Daemon>(options_.service, timeout());
    return *daemon_;
}

Jobs& Session::jobs() {
    if (!jobs_)
        jobs_ = std::make_unique<Jobs>(timeout());
    return *jobs_;
}

Status Session::report(const nlohmann::ordered_json& json,
                       const std::function<void()>& write) const {
    if (options_.json)
        out() << jsonText(json);
    else
        write();
    return Status::done;
}

void Session::note(const std::string& text) const {
    terminal_.err << "zpctl: note: " << printable(text) << '\n';
}

Status Session::fail(const Failure& failure) const {
    if (options_.json) {
        nlohmann::ordered_json error{{"message", failure.message}};
        if (failure.code)
            error["code"] = *failure.code;
        if (!failure.conflicts.empty())
            error["conflicts"] = failure.conflicts;
        terminal_.err << jsonText({{"error", error}});
        return failure.status;
    }
    terminal_.err << "zpctl: " << printable(failure.message);
    if (failure.code)
        terminal_.err << " (code " << *failure.code << ')';
    terminal_.err << '\n';
    for (const std::string& identifier : failure.conflicts)
        terminal_.err << "  " << printable(identifier) << '\n';
    return failure.status;
}

} // namespace zpctl
