// Shifts the times of subtitles: "+1500 00:00:01,000 --> 00:00:03,500" is answered with the two
// times 1500 ms later. Times never go below zero.

#include <algorithm>
#include <array>
#include <cinttypes>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <string>
#include <string_view>

#include "examples/plugins/Conversation.h"

namespace {

struct Request {
    std::int64_t offset = 0; // milliseconds, as all times here
    std::int64_t begin = 0;
    std::int64_t end = 0;
};

std::int64_t milliseconds(const std::array<unsigned, 4>& fields) {
    const auto [hours, minutes, seconds, rest] = fields;
    return ((std::int64_t{hours} * 60 + minutes) * 60 + seconds) * 1000 + rest;
}

std::optional<Request> parse(const std::string& line) {
    std::int32_t offset = 0;
    std::array<unsigned, 4> a{};
    std::array<unsigned, 4> b{};
    const int fields = std::sscanf(line.c_str(), "%9" SCNd32 " %2u:%2u:%2u,%3u --> %2u:%2u:%2u,%3u",
                                   &offset, &a[0], &a[1], &a[2], &a[3], &b[0], &b[1], &b[2], &b[3]);
    if (fields != 9)
        return std::nullopt;
    return Request{.offset = offset, .begin = milliseconds(a), .end = milliseconds(b)};
}

std::string timeText(std::int64_t time) {
    const std::int64_t shown = std::max<std::int64_t>(time, 0);
    char text[48];
    std::snprintf(text, sizeof text, "%02" PRId64 ":%02" PRId64 ":%02" PRId64 ",%03" PRId64,
                  shown / 3600000, shown / 60000 % 60, shown / 1000 % 60, shown % 1000);
    return text;
}

std::string shifted(std::string_view line) {
    const auto request = parse(std::string(line));
    if (!request)
        return "error: expected OFFSET HH:MM:SS,mmm --> HH:MM:SS,mmm";
    return timeText(request->begin + request->offset) + " --> " +
           timeText(request->end + request->offset);
}

} // namespace

int main() {
    return example::converse(shifted);
}
