#include <algorithm>
#include <cmath>

#include "platform/plist/PropertyList.h"
#include "platform/plist/Readers.h"
#include "platform/plist/TextForms.h"
#include "platform/plist/Utf8.h"

namespace platform::plist {

namespace {

constexpr std::string_view header = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                                    "<plist version=\"1.0\">\n";
constexpr std::string_view footer = "</plist>\n";

// Deeper than this, lines are not indented further: people no longer count the levels there, and a
// list must not become much larger than what is in it.
constexpr std::size_t deepestIndent = 8;

// XML 1.0, production 2 (Char).
bool isXmlCharacter(char32_t c) {
    if (c < 0x20)
        return c == '\t' || c == '\n' || c == '\r';
    return c != 0xfffe && c != 0xffff;
}

// Writes one value after the other into `out`. Each step tells whether the value could be written;
// the first that cannot leaves its reason in `failure`. Lives for one call.
class Writer {
public:
    [[nodiscard]] bool write(const Value& value, std::size_t level);

    std::string out{header};
    std::string failure;

private:
    [[nodiscard]] bool fail(const char* reason) {
        failure = reason;
        return false;
    }

    void indent(std::size_t level) { out.append(std::min(level, deepestIndent), '\t'); }

    void element(std::string_view name, std::string_view content) {
        out.append("<").append(name).append(">").append(content);
        out.append("</").append(name).append(">\n");
    }

    [[nodiscard]] bool textElement(std::string_view name, std::string_view text);
    [[nodiscard]] bool real(double number);
    [[nodiscard]] bool date(Date date);
    [[nodiscard]] bool array(const Array& array, std::size_t level);
    [[nodiscard]] bool dictionary(const Dictionary& dictionary, std::size_t level);
};

bool Writer::textElement(std::string_view name, std::string_view text) {
    out.append("<").append(name).append(">");
    while (!text.empty()) {
        const auto character = takeCharacter(text);
        if (!character || !isXmlCharacter(*character))
            return fail("text with a character that XML cannot hold");
        if (*character == '&') {
            out += "&amp;";
        } else if (*character == '<') {
            out += "&lt;";
        } else if (*character == '>') {
            out += "&gt;";
        } else if (*character == '\r') {
            out += "&#13;"; // readers take a bare one for a line's end
        } else {
            appendCharacter(out, *character);
        }
    }
    out.append("</").append(name).append(">\n");
    return true;
}

bool Writer::real(double number) {
    if (!std::isfinite(number))
        return fail("a number that is not finite");
    element("real", realText(number));
    return true;
}

bool Writer::date(Date date) {
    const auto text = dateText(date);
    if (!text)
        return fail("a date outside the years 0 to 9999");
    element("date", *text);
    return true;
}

bool Writer::array(const Array& array, std::size_t level) {
    if (array.empty()) {
        out += "<array/>\n";
        return true;
    }
    out += "<array>\n";
    for (const Value& item : array) {
        if (!write(item, level + 1))
            return false;
    }
    indent(level);
    out += "</array>\n";
    return true;
}

bool Writer::dictionary(const Dictionary& dictionary, std::size_t level) {
    if (dictionary.empty()) {
        out += "<dict/>\n";
        return true;
    }
    out += "<dict>\n";
    for (const DictionaryEntry& entry : dictionary) {
        indent(level + 1);
        if (!textElement("key", entry.key.view()) || !write(entry.value, level + 1))
            return false;
    }
    indent(level);
    out += "</dict>\n";
    return true;
}

bool Writer::write(const Value& value, std::size_t level) {
    indent(level);
    switch (value.kind()) {
    case Value::Kind::boolean:
        out += *value.boolean() ? "<true/>\n" : "<false/>\n";
        return true;
    case Value::Kind::signedInteger:
        element("integer", std::to_string(*value.signedInteger()));
        return true;
    case Value::Kind::unsignedInteger:
        element("integer", std::to_string(*value.unsignedInteger()));
        return true;
    case Value::Kind::real:
        return real(*value.real());
    case Value::Kind::string:
        return textElement("string", *value.string());
    case Value::Kind::date:
        return date(*value.date());
    case Value::Kind::data:
        element("data", dataText(*value.data()));
        return true;
    case Value::Kind::array:
        return array(*value.array(), level);
    case Value::Kind::dictionary:
        return dictionary(*value.dictionary(), level);
    case Value::Kind::null:
    case Value::Kind::uuid:
    case Value::Kind::url:
    case Value::Kind::encoded:
        break;
    }
    return fail("a value of a kind that property lists do not have");
}

} // namespace

std::expected<std::string, Error> writeXml(const Value& value) {
    Writer writer;
    if (!writer.write(value, 0))
        return std::unexpected(corrupt("property list: " + writer.failure));
    writer.out += footer;
    return std::move(writer.out);
}

} // namespace platform::plist
