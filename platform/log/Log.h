#pragma once

#include <atomic>
#include <cstdint>
#include <span>
#include <string>

#include "platform/log/Argument.h"

namespace platform::log {

enum class Level : std::uint8_t { debug, info, standard, error }; // "standard" is "default"

// The handle of one category of the subsystem "com.tovana.Zephrin"; made once, lives for ever.
// Lines may be written from any thread; they go through a bounded buffer to a writer thread.
class Category {
public:
    explicit Category(const char* name) : name_(name) {}

    Category(const Category&) = delete;
    Category& operator=(const Category&) = delete;

    [[nodiscard]] const char* name() const { return name_; }

    [[nodiscard]] bool enabled(Level level) const noexcept { return level >= threshold(); }

    // Formats are the system's fixed texts; Render.h tells their language. Arguments are looked at
    // only when the level is enabled.
    template <class... A>
    void debug(const char* format, const A&... args) const {
        line(Level::debug, format, args...);
    }

    template <class... A>
    void info(const char* format, const A&... args) const {
        line(Level::info, format, args...);
    }

    template <class... A>
    void standard(const char* format, const A&... args) const {
        line(Level::standard, format, args...);
    }

    template <class... A>
    void error(const char* format, const A&... args) const {
        line(Level::error, format, args...);
    }

private:
    static Level threshold() noexcept { return least.load(std::memory_order_relaxed); }

    template <class... A>
    void line(Level level, const char* format, const A&... args) const {
        if (!enabled(level))
            return;
        if constexpr (sizeof...(A) == 0) {
            write(level, format, {});
        } else {
            const Argument list[] = {Argument(args)...};
            write(level, format, list);
        }
    }

    void write(Level level, const char* format, std::span<const Argument> args) const;

    friend void configureFromEnvironment();
    friend void silence();
    static std::atomic<Level> least;
    const char* name_;
};

// Reads ZEPHRIN_LOG (debug|info|default|error) and ZEPHRIN_LOG_PRIVATE. Called once, first thing in
// main.
void configureFromEnvironment();

// Instead: writes nothing, not even errors. For tools whose standard error a person reads.
void silence();

// Waits until everything written so far is out, or the reader of standard error makes no progress
// for too long. Called by itself when the process exits normally.
void flush();

// The category "default": the system log of the daemon's own stream.
[[nodiscard]] const Category& defaultLog();

} // namespace platform::log
