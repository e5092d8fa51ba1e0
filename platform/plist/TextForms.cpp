#include "platform/plist/TextForms.h"

#include <algorithm>
#include <array>
#include <cassert>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <limits>

namespace platform::plist {

namespace {

constexpr std::string_view base64Digits =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

std::string_view trimmed(std::string_view text) {
    while (!text.empty() && isXmlSpace(text.front()))
        text.remove_prefix(1);
    while (!text.empty() && isXmlSpace(text.back()))
        text.remove_suffix(1);
    return text;
}

template <class T, class... Format>
std::optional<T> readWhole(std::string_view text, Format... format) {
    T number{};
    const char* const end = text.data() + text.size();
    const auto [stop, failure] = std::from_chars(text.data(), end, number, format...);
    return failure == std::errc() && stop == end ? std::optional(number) : std::nullopt;
}

constexpr std::array<signed char, 256> makeBase64Values() {
    std::array<signed char, 256> values{};
    values.fill(-1);
    for (std::size_t i = 0; i < base64Digits.size(); ++i)
        values[static_cast<unsigned char>(base64Digits[i])] = static_cast<signed char>(i);
    return values;
}

std::string withoutSpace(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        if (!isXmlSpace(c))
            out += c;
    }
    return out;
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

// Seconds since the Unix epoch, exactly: a whole number and decimal digits after the point. The
// digits count upwards also before the epoch, as those of a clock do: -0.25 is -1 and "75".
struct DecimalSeconds {
    std::int64_t whole = 0;
    std::string fraction;
};

// One less the fraction. REQUIRES: digits, not all of them 0
std::string complement(std::string digits) {
    const auto last = digits.find_last_not_of('0');
    for (std::size_t i = 0; i <= last; ++i)
        digits[i] = static_cast<char>((i < last ? '9' : '9' + 1) - digits[i] + '0');
    return digits;
}

DecimalSeconds secondsOf(Date date) {
    char room[400]; // more than what the smallest number has
    const double size = std::fabs(date.secondsSinceEpoch);
    const auto written = std::to_chars(room, room + sizeof room, size, std::chars_format::fixed);
    const std::string_view text(room, written.ptr);
    const auto point = std::min(text.find('.'), text.size());
    DecimalSeconds result{readWhole<std::int64_t>(text.substr(0, point)).value_or(0), {}};
    if (point != text.size())
        result.fraction = text.substr(point + 1);
    if (date.secondsSinceEpoch >= 0)
        return result;
    result.whole = -result.whole;
    if (!result.fraction.empty()) {
        --result.whole;
        result.fraction = complement(std::move(result.fraction));
    }
    return result;
}

std::optional<Date> dateOf(DecimalSeconds decimal) {
    const bool below = decimal.whole < 0;
    if (below && decimal.fraction.find_first_not_of('0') != std::string::npos) {
        ++decimal.whole;
        decimal.fraction = complement(std::move(decimal.fraction));
    }
    const std::string text =
        std::to_string(below ? -decimal.whole : decimal.whole) + "." + decimal.fraction + "0";
    const auto size = readWhole<double>(text, std::chars_format::fixed);
    return size ? std::optional(Date{below ? -*size : *size}) : std::nullopt;
}

} // namespace

bool isXmlSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\r';
}

std::optional<Value> readInteger(std::string_view text) {
    text = trimmed(text);
    const bool negative = text.starts_with('-');
    if (negative || text.starts_with('+'))
        text.remove_prefix(1);
    const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
    if (hexadecimal)
        text.remove_prefix(2);
    const auto size = readWhole<std::uint64_t>(text, hexadecimal ? 16 : 10);
    if (!size)
        return std::nullopt;
    if (!negative)
        return Value(*size);
    constexpr std::uint64_t mostNegative = std::uint64_t{1} << 63;
    if (*size > mostNegative)
        return std::nullopt;
    return Value(static_cast<std::int64_t>(std::uint64_t{0} - *size));
}

std::optional<Value> readReal(std::string_view text) {
    text = trimmed(text);
    if (text.starts_with('+'))
        text.remove_prefix(1);
    if (text.starts_with('+'))
        return std::nullopt;
    const auto number = readWhole<double>(text, std::chars_format::general);
    return number && std::isfinite(*number) ? std::optional<Value>(*number) : std::nullopt;
}

std::optional<Value> readDate(std::string_view text) {
    text = trimmed(text);
    constexpr std::string_view shape = "dddd-dd-ddTdd:dd:dd";
    if (text.size() <= shape.size() || text.back() != 'Z')
        return std::nullopt;
    const std::string_view fraction = text.substr(shape.size(), text.size() - shape.size() - 1);
    if (!fraction.empty() && (fraction.size() < 2 || fraction[0] != '.' ||
                              !std::ranges::all_of(fraction.substr(1), isDigit)))
        return std::nullopt;
    for (std::size_t i = 0; i < shape.size(); ++i) {
        if (shape[i] == 'd' ? !isDigit(text[i]) : text[i] != shape[i])
            return std::nullopt;
    }
    const auto number = [&](std::size_t at, std::size_t length) {
        return readWhole<int>(text.substr(at, length)).value_or(-1);
    };
    using namespace std::chrono;
    const year_month_day day(year(number(0, 4)), month(static_cast<unsigned>(number(5, 2))),
                             std::chrono::day(static_cast<unsigned>(number(8, 2))));
    const int hour = number(11, 2);
    const int minute = number(14, 2);
    const int second = number(17, 2);
    if (!day.ok() || hour > 23 || minute > 59 || second > 59)
        return std::nullopt;
    const auto time = sys_days(day) + hours(hour) + minutes(minute) + seconds(second);
    const auto date = dateOf(
        {time.time_since_epoch().count(), std::string(fraction.substr(fraction.empty() ? 0 : 1))});
    return date ? std::optional<Value>(*date) : std::nullopt;
}

std::optional<Value> readData(std::string_view text) {
    static constexpr auto values = makeBase64Values();
    const std::string digits = withoutSpace(text);
    if (digits.size() % 4 != 0)
        return std::nullopt;
    const std::size_t padding = digits.ends_with("==") ? 2 : digits.ends_with('=') ? 1 : 0;
    std::string bytes;
    bytes.reserve(digits.size() / 4 * 3);
    std::uint32_t bits = 0;
    for (std::size_t i = 0; i < digits.size(); ++i) {
        const bool padded = i >= digits.size() - padding;
        const int value = padded ? 0 : values[static_cast<unsigned char>(digits[i])];
        if (value < 0)
            return std::nullopt;
        bits = (bits << 6) | static_cast<std::uint32_t>(value);
        if (i % 4 == 3) {
            bytes += static_cast<char>(bits >> 16);
            bytes += static_cast<char>(bits >> 8);
            bytes += static_cast<char>(bits);
        }
    }
    bytes.resize(bytes.size() - padding);
    return Value(Data{SharedBytes(bytes)});
}

bool hasDateText(Date date) {
    constexpr double earliest = -62'167'219'200.0; // 0000-01-01T00:00:00Z
    constexpr double end = 253'402'300'800.0;      // 10000-01-01T00:00:00Z
    return date.secondsSinceEpoch >= earliest && date.secondsSinceEpoch < end;
}

std::string dateText(Date date) {
    assert(hasDateText(date));
    using namespace std::chrono;
    const DecimalSeconds decimal = secondsOf(date);
    const sys_seconds time{seconds(decimal.whole)};
    const auto midnight = floor<days>(time);
    const year_month_day day(midnight);
    const hh_mm_ss clock(time - midnight);
    char room[40];
    std::snprintf(
        room, sizeof room, "%04d-%02u-%02uT%02d:%02d:%02d", int(day.year()), unsigned(day.month()),
        unsigned(day.day()), static_cast<int>(clock.hours().count()),
        static_cast<int>(clock.minutes().count()), static_cast<int>(clock.seconds().count()));
    return room + (decimal.fraction.empty() ? "" : "." + decimal.fraction) + "Z";
}

std::string dataText(const Data& data) {
    const std::string_view bytes = data.bytes.view();
    std::string out;
    out.reserve((bytes.size() + 2) / 3 * 4);
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        const std::size_t count = std::min<std::size_t>(3, bytes.size() - i);
        std::uint32_t bits = 0;
        for (std::size_t k = 0; k < 3; ++k)
            bits = (bits << 8) | (k < count ? static_cast<unsigned char>(bytes[i + k]) : 0U);
        for (std::size_t k = 0; k < 4; ++k)
            out += k <= count ? base64Digits[(bits >> (18 - 6 * k)) & 0x3f] : '=';
    }
    return out;
}

std::string realText(double number) {
    char room[32];
    return {room, std::to_chars(room, room + sizeof room, number).ptr};
}

} // namespace platform::plist
