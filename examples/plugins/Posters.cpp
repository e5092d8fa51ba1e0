// Paints a poster for a title: each line from the host is a title, each answer one SVG picture.
// The colours depend on the title alone, so that a title keeps its poster.

#include <cstdint>
#include <string>
#include <string_view>

#include "examples/plugins/Conversation.h"

namespace {

// FNV-1a (draft-eastlake-fnv): spreads short texts well enough for colours.
std::uint32_t hashOf(std::string_view text) {
    std::uint32_t hash = 2166136261U;
    for (const char c : text)
        hash = (hash ^ static_cast<unsigned char>(c)) * 16777619U;
    return hash;
}

std::string hue(std::uint32_t number) {
    return "hsl(" + std::to_string(number % 360) + ",60%,40%)";
}

std::string escaped(std::string_view title) {
    std::string text;
    for (const char c : title) {
        switch (c) {
        case '&':
            text += "&amp;";
            break;
        case '<':
            text += "&lt;";
            break;
        default:
            text += c;
        }
    }
    return text;
}

std::string poster(std::string_view title) {
    const std::uint32_t hash = hashOf(title);
    return "<svg xmlns='http://www.w3.org/2000/svg' width='200' height='300'>"
           "<rect width='200' height='300' fill='" +
           hue(hash) +
           "'/>"
           "<circle cx='" +
           std::to_string(40 + (hash >> 8) % 120) + "' cy='110' r='70' fill='" + hue(hash >> 16) +
           "'/>"
           "<text x='100' y='260' fill='white' text-anchor='middle'>" +
           escaped(title) + "</text></svg>";
}

} // namespace

int main() {
    return example::converse(poster);
}
