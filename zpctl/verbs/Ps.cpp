// "ps": the plug-ins that run, whoever started them.

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <ostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "zpctl/Json.h"
#include "zpctl/PlugIn.h"
#include "zpctl/Session.h"
#include "zpctl/Table.h"
#include "zpctl/verbs/Verbs.h"

namespace zpctl {

namespace {

using platform::Dictionary;
using platform::Value;

constexpr const char* explanation =
    R"(Each is a process of its own, with those that it made. HOST is the process that started it, with
its program. AGE is how long it has run.

Examples:
  zpctl ps
  zpctl --json ps

With --json: an array of {"identifier", "version", "uuid", "pid", "hostPid", "hostPath", "profile",
"user", "started", "confinement": {"wanted", "enforced"}}: what the profile asks for, and what the
kernel was able to give.)";

std::string textAt(const Dictionary& instance, std::string_view key) {
    const Value* const value = instance.find(key);
    if (!value)
        return {};
    if (const auto number = value->integerValue())
        return std::to_string(*number);
    return std::string(value->string().value_or(""));
}

std::string hostOf(const Dictionary& instance) {
    const std::string path = textAt(instance, "hostPath");
    return textAt(instance, "hostPid") + (path.empty() ? "" : " " + path);
}

// "12 s", "3 min 7 s", "2 h 5 min".
std::string ageText(std::int64_t seconds) {
    constexpr std::int64_t minute = 60;
    constexpr std::int64_t hour = 60 * minute;
    const auto text = [](std::int64_t number, const char* unit) {
        return std::to_string(number) + ' ' + unit;
    };
    if (seconds < minute)
        return text(seconds, "s");
    if (seconds < hour)
        return text(seconds / minute, "min ") + text(seconds % minute, "s");
    return text(seconds / hour, "h ") + text(seconds % hour / minute, "min");
}

std::string ageOf(const Dictionary& instance) {
    const Value* const started = instance.find("started");
    const auto date = started ? started->date() : std::nullopt;
    if (!date)
        return {};
    const std::chrono::duration<double> now = std::chrono::system_clock::now().time_since_epoch();
    return ageText(static_cast<std::int64_t>(std::max(0.0, now.count() - date->secondsSinceEpoch)));
}

void writeInstances(const platform::Array& instances, const Session& session) {
    Table table({{"PID"},
                 {"IDENTIFIER", Tone::strong},
                 {"VERSION"},
                 {"PROFILE"},
                 {"AGE"},
                 {"HOST", Tone::faint}});
    for (const Value& each : instances) {
        if (const Dictionary* const instance = each.dictionary())
            table.add({textAt(*instance, "pid"), textAt(*instance, "identifier"),
                       textAt(*instance, "version"), textAt(*instance, "profile"), ageOf(*instance),
                       hostOf(*instance)});
    }
    if (!table.empty())
        table.write(session.out(), session.paint());
    session.out() << counted(instances.size(), "plug-in") << " running\n";
}

Status ps(Session& session) {
    const auto instances = session.jobs().instances();
    if (!instances)
        return session.fail(instances.error());
    return session.report(toJson(Value(*instances)), [&] { writeInstances(*instances, session); });
}

} // namespace

Action declarePs(CLI::App& command) {
    command.footer(explanation);
    return [](Session& session) { return ps(session); };
}

} // namespace zpctl
