#include "platform/value/NumericOrder.h"

#include <algorithm>

namespace platform {

namespace {

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

// Takes the digit run at the front of `text` off it and returns it without leading zeros.
std::string_view takeNumber(std::string_view& text) {
    const auto end = std::ranges::find_if_not(text, isDigit) - text.begin();
    std::string_view run = text.substr(0, static_cast<std::size_t>(end));
    text.remove_prefix(run.size());
    run.remove_prefix(std::min(run.find_first_not_of('0'), run.size()));
    return run;
}

std::weak_ordering compareNumbers(std::string_view a, std::string_view b) {
    if (a.size() != b.size())
        return a.size() <=> b.size();
    return a <=> b;
}

} // namespace

std::weak_ordering compareNumerically(std::string_view a, std::string_view b) {
    if (a == b)
        return std::weak_ordering::equivalent; // the usual case, at the speed of memcmp
    while (!a.empty() && !b.empty()) {
        std::weak_ordering order = std::weak_ordering::equivalent;
        if (isDigit(a.front()) && isDigit(b.front())) {
            order = compareNumbers(takeNumber(a), takeNumber(b));
        } else {
            order = static_cast<unsigned char>(a.front()) <=> static_cast<unsigned char>(b.front());
            a.remove_prefix(1);
            b.remove_prefix(1);
        }
        if (order != 0)
            return order;
    }
    return a.size() <=> b.size();
}

std::string numericEqualityKey(std::string_view text) {
    std::string key;
    key.reserve(text.size());
    while (!text.empty()) {
        if (!isDigit(text.front())) {
            key += text.front();
            text.remove_prefix(1);
            continue;
        }
        const std::string_view number = takeNumber(text);
        key += number.empty() ? "0" : number;
    }
    return key;
}

} // namespace platform
