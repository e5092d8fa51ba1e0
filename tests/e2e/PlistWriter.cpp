#include "tests/e2e/PlistWriter.h"

#include <algorithm>
#include <bit>
#include <ctime>
#include <stdexcept>
#include <vector>

namespace e2e {

namespace {

// Seconds from the Unix epoch to the property lists' own, 2001-01-01.
constexpr double plistEpoch = 978307200;

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

std::string bigEndian(std::uint64_t n, unsigned size) {
    std::string out;
    for (unsigned i = size; i-- > 0;)
        out.push_back(static_cast<char>(n >> (8 * i)));
    return out;
}

bool isAscii(const std::string& text) {
    return std::all_of(text.begin(), text.end(), [](char c) { return (c & 0x80) == 0; });
}

// The UTF-16 code units of well-formed UTF-8.
std::vector<unsigned> utf16Of(const std::string& text) {
    std::vector<unsigned> units;
    for (std::size_t i = 0; i < text.size();) {
        const auto lead = static_cast<unsigned char>(text[i++]);
        const int more = lead < 0x80 ? 0 : lead < 0xe0 ? 1 : lead < 0xf0 ? 2 : 3;
        unsigned point = more == 0 ? lead : lead & (0x3fu >> more);
        for (int k = 0; k < more; ++k)
            point = point << 6 | (static_cast<unsigned char>(text[i++]) & 0x3fu);
        if (point < 0x10000) {
            units.push_back(point);
            continue;
        }
        units.push_back(0xd800 + ((point - 0x10000) >> 10));
        units.push_back(0xdc00 + ((point - 0x10000) & 0x3ff));
    }
    return units;
}

std::string integerObject(std::uint64_t n) {
    return '\x13' + bigEndian(n, 8);
}

// Objects in the order in which they are met; every reference takes two bytes.
class BinaryWriter {
public:
    std::string write(const Item& root) {
        add(root);
        std::string out = "bplist00";
        std::string offsets;
        for (const std::string& object : objects_) {
            offsets += bigEndian(out.size(), 4);
            out += object;
        }
        const std::size_t table = out.size();
        return out + offsets + std::string(6, '\0') + '\x04' + '\x02' +
               bigEndian(objects_.size(), 8) + bigEndian(0, 8) + bigEndian(table, 8);
    }

private:
    std::size_t add(const Item& item) {
        const std::size_t index = objects_.size();
        objects_.emplace_back();
        std::string object = bytesOf(item);
        objects_[index] = std::move(object);
        return index;
    }

    static std::string marked(unsigned kind, std::size_t count) {
        const auto marker = [&](std::size_t low) {
            return std::string(1, static_cast<char>(kind << 4 | low));
        };
        return count < 15 ? marker(count) : marker(15) + integerObject(count);
    }

    static std::string textOf(const std::string& text) {
        if (isAscii(text))
            return marked(5, text.size()) + text;
        const std::vector<unsigned> units = utf16Of(text);
        std::string out = marked(6, units.size());
        for (const unsigned unit : units)
            out += bigEndian(unit, 2);
        return out;
    }

    std::string reference(const Item& item) { return bigEndian(add(item), 2); }

    std::string bytesOf(const Item& item) {
        std::string keys;
        std::string values;
        switch (item.kind()) {
        case Item::Kind::boolean:
            return item.truth() ? "\x09" : "\x08";
        case Item::Kind::number:
        case Item::Kind::negative:
            return integerObject(static_cast<std::uint64_t>(item.integer()));
        case Item::Kind::real:
            return '\x23' + bigEndian(std::bit_cast<std::uint64_t>(item.real()), 8);
        case Item::Kind::tag:
            return '\x33' +
                   bigEndian(std::bit_cast<std::uint64_t>(item.items()[0].real() - plistEpoch), 8);
        case Item::Kind::bytes:
            return marked(4, item.text().size()) + item.text();
        case Item::Kind::text:
            return textOf(item.text());
        case Item::Kind::array:
            for (const Item& each : item.items())
                values += reference(each);
            return marked(10, item.items().size()) + values;
        case Item::Kind::map:
            for (const std::string& key : item.keys())
                keys += reference(Item(key));
            for (const std::string& key : item.keys())
                values += reference(item[key]);
            return marked(13, item.keys().size()) + keys + values;
        case Item::Kind::null:
            break;
        }
        throw std::runtime_error("a property list has no null");
    }

    std::vector<std::string> objects_;
};

} // namespace

std::string xmlPlist(const Item& root) {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + xmlOf(root) +
           "</plist>\n";
}

std::string binaryPlist(const Item& root) {
    return BinaryWriter().write(root);
}

} // namespace e2e
