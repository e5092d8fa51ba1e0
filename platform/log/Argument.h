#pragma once

#include <concepts>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace platform::log {

// One argument of a log line: a number, a text, or a thing that can tell of itself. Refers to what
// it was made from, and so lives for the call only. A thing is asked for its description only
// when the line shows it: a private argument costs nothing.
class Argument {
public:
    enum class Kind : std::uint8_t { signedNumber, unsignedNumber, pointer, text, thing };

    template <std::signed_integral T>
    Argument(T n)
        : kind_(Kind::signedNumber),
          number_(static_cast<std::uint64_t>(static_cast<std::int64_t>(n))) {}

    template <std::unsigned_integral T>
    Argument(T n) : kind_(Kind::unsignedNumber), number_(n) {}

    Argument(const void* p) : kind_(Kind::pointer), number_(reinterpret_cast<std::uintptr_t>(p)) {}

    Argument(const char* text) : Argument(std::string_view(text ? text : "(null)")) {}

    Argument(std::string_view text) : kind_(Kind::text), text_(text) {}

    Argument(const std::string& text) : Argument(std::string_view(text)) {}

    Argument(const Uuid& uuid)
        : kind_(Kind::thing),
          thing_(&uuid),
          describe_([](const void* p) { return static_cast<const Uuid*>(p)->text(); }) {}

    // Anything that can tell of itself: describe(x), found by argument-dependent look-up.
    template <class T>
        requires requires(const T& t) {
            { describe(t) } -> std::convertible_to<std::string>;
        } && (!std::integral<T>) && (!std::convertible_to<const T&, std::string_view>)
    Argument(const T& thing)
        : kind_(Kind::thing), thing_(&thing), describe_([](const void* p) -> std::string {
              return describe(*static_cast<const T*>(p));
          }) {}

    Argument(const Argument&) = delete;
    Argument& operator=(const Argument&) = delete;

    [[nodiscard]] Kind kind() const { return kind_; }

    [[nodiscard]] std::uint64_t number() const { return number_; }

    // Of a text.
    [[nodiscard]] std::string_view text() const { return text_; }

    // Of a thing.
    [[nodiscard]] std::string description() const { return describe_(thing_); }

private:
    Kind kind_;
    std::uint64_t number_ = 0;
    std::string_view text_;
    const void* thing_ = nullptr;
    std::string (*describe_)(const void*) = nullptr;
};

} // namespace platform::log
