#pragma once

#include <atomic>
#include <concepts>
#include <cstdint>
#include <initializer_list>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace platform::log {

enum class Level : std::uint8_t { debug, info, standard, error }; // "standard" is "default"

// One argument of a log line: a number, or text that was made for it. Lives for the call only.
class Argument {
public:
    template <std::signed_integral T>
    Argument(T n)
        : kind_(Kind::signedNumber),
          number_(static_cast<std::uint64_t>(static_cast<std::int64_t>(n))) {}

    template <std::unsigned_integral T>
    Argument(T n) : kind_(Kind::unsignedNumber), number_(n) {}

    Argument(const void* p) : kind_(Kind::pointer), number_(reinterpret_cast<std::uintptr_t>(p)) {}

    Argument(const char* text) : Argument(std::string_view(text)) {}

    Argument(std::string_view text) : kind_(Kind::text), borrowed_(text) {}

    Argument(const std::string& text) : Argument(std::string_view(text)) {}

    // Anything that can tell of itself: describe(x), found by argument-dependent look-up.
    template <class T>
        requires requires(const T& t) {
            { describe(t) } -> std::convertible_to<std::string>;
        } && (!std::integral<T>) && (!std::convertible_to<const T&, std::string_view>)
    Argument(const T& thing) : kind_(Kind::text), owned_(describe(thing)), borrowed_(owned_) {}

    Argument(const Uuid& uuid) : kind_(Kind::text), owned_(uuid.text()), borrowed_(owned_) {}

    Argument(const Argument&) = delete;
    Argument& operator=(const Argument&) = delete;

    enum class Kind : std::uint8_t { signedNumber, unsignedNumber, pointer, text };

    [[nodiscard]] Kind kind() const { return kind_; }

    [[nodiscard]] std::uint64_t number() const { return number_; }

    [[nodiscard]] std::string_view text() const { return borrowed_; }

private:
    Kind kind_;
    std::uint64_t number_ = 0;
    std::string owned_;
    std::string_view borrowed_;
};

// The handle of one category of the subsystem "com.tovana.Zephrin"; made once, lives for ever.
// Lines may be written from any thread; they go through a bounded buffer to a writer thread.
class Category {
public:
    explicit Category(const char* name) : name_(name) {}

    Category(const Category&) = delete;
    Category& operator=(const Category&) = delete;

    [[nodiscard]] const char* name() const { return name_; }

    [[nodiscard]] bool enabled(Level level) const noexcept { return level >= threshold(); }

    // Formats are the system's fixed texts: %@ %s %d %u %ld %lu %lx %llu %p %%, with the privacy
    // markers "%{public}@" and "%{public}s" (shown), "%{errno}d" (number and text) and
    // "%{uuid_t}.16P". Unmarked arguments are private: shown as "<private>" unless
    // ZEPHRIN_LOG_PRIVATE=1. Arguments are looked at only when the level is enabled.
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
    static std::atomic<Level> least;
    const char* name_;
};

// Reads ZEPHRIN_LOG (debug|info|default|error) and ZEPHRIN_LOG_PRIVATE. Called once, first thing in
// main.
void configureFromEnvironment();

// Waits until everything written so far is out. For the end of the process.
void flush();

// The category "default": the system log of the daemon's own stream.
[[nodiscard]] const Category& defaultLog();

// Renders a format with its arguments, as a line would show it. `showPrivate` as the setting.
[[nodiscard]] std::string render(const char* format, std::span<const Argument> args,
                                 bool showPrivate);

} // namespace platform::log
