#include "tests/e2e/PlistWriter.h"

#include <ctime>
#include <stdexcept>

namespace e2e {

namespace {

std::string base64(const std::string& bytes) {
    constexpr std::string_view digits =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string out;
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        unsigned group = 0;
        for (std::size_t k = 0; k < 3; ++k)
            group =
                group << 8 | (i + k < bytes.size() ? static_cast<unsigned char>(bytes[i + k]) : 0u);
        for (std::size_t k = 0; k < 4; ++k)
            out += i + k > bytes.size() ? '=' : digits[group >> (18 - 6 * k) & 63];
    }
    return out;
}

std::string escaped(const std::string& text) {
    std::string out;
    for (const char c : text)
        out += c == '&' ? "&amp;" : c == '<' ? "&lt;" : std::string(1, c);
    return out;
}

std::string isoDate(double seconds) {
    const auto whole = static_cast<std::time_t>(seconds);
    std::tm parts{};
    gmtime_r(&whole, &parts);
    char text[32];
    std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts);
    return text;
}

std::string element(const char* name, const std::string& content) {
    return std::string("<") + name + ">" + content + "</" + name + ">\n";
}

std::string xmlOf(const Item& item) {
    std::string content;
    switch (item.kind()) {
    case Item::Kind::boolean:
        return item.truth() ? "<true/>\n" : "<false/>\n";
    case Item::Kind::number:
        return element("integer", std::to_string(item.number()));
    case Item::Kind::negative:
        return element("integer", std::to_string(item.integer()));
    case Item::Kind::real:
        return element("real", std::to_string(item.real()));
    case Item::Kind::text:
        return element("string", escaped(item.text()));
    case Item::Kind::bytes:
        return element("data", base64(item.text()));
    case Item::Kind::tag:
        return element("date", isoDate(item.items()[0].real()));
    case Item::Kind::array:
        for (const Item& each : item.items())
            content += xmlOf(each);
        return element("array", content);
    case Item::Kind::map:
        for (const std::string& key : item.keys())
            content += element("key", escaped(key)) + xmlOf(item[key]);
        return element("dict", content);
    case Item::Kind::null:
        break;
    }
    throw std::runtime_error("a property list has no null");
}

} // namespace

std::string xmlPlist(const Item& root) {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + xmlOf(root) +
           "</plist>\n";
}

} // namespace e2e
