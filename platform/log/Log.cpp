#include "platform/log/Log.h"

#include <cstdlib>
#include <ctime>
#include <optional>
#include <utility>

#include "platform/log/Render.h"
#include "platform/log/Writer.h"

namespace platform::log {

namespace {

std::atomic<bool> showPrivate = false;

std::optional<Level> levelNamed(std::string_view name) {
    for (const Level level : {Level::debug, Level::info, Level::standard, Level::error}) {
        if (name == levelName(level))
            return level;
    }
    return std::nullopt;
}

std::int64_t nowNanoseconds() {
    struct ::timespec now = {};
    ::clock_gettime(CLOCK_REALTIME, &now);
    return now.tv_sec * 1'000'000'000 + now.tv_nsec;
}

// The room that a thread renders its lines in. A description may itself write a line: that one
// then finds the room taken, and uses its own.
thread_local std::string renderingRoom;
constexpr std::size_t keptRoom = 4096;

} // namespace

std::atomic<Level> Category::least = Level::standard;

void Category::write(Level level, const char* format, std::span<const Argument> args) const {
    std::string text = std::exchange(renderingRoom, std::string());
    text.clear();
    renderLineTo(text, format, args, showPrivate.load(std::memory_order_relaxed));
    Writer::shared().append(level, name_, nowNanoseconds(), text);
    if (text.capacity() <= keptRoom)
        renderingRoom = std::move(text);
}

void configureFromEnvironment() {
    const char* least = std::getenv("ZEPHRIN_LOG");
    Category::least = levelNamed(least ? least : "").value_or(Level::standard);
    const char* shown = std::getenv("ZEPHRIN_LOG_PRIVATE");
    showPrivate = shown && std::string_view(shown) == "1";
}

void silence() {
    Category::least = static_cast<Level>(static_cast<std::uint8_t>(Level::error) + 1);
}

void flush() {
    Writer::shared().flush();
}

const Category& defaultLog() {
    static const Category category("default");
    return category;
}

} // namespace platform::log
