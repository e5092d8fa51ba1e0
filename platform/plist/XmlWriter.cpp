#include <algorithm>
#include <cassert>
#include <cmath>

#include "platform/plist/PropertyList.h"
#include "platform/plist/Readers.h"
#include "platform/plist/TextForms.h"
#include "platform/value/Utf8.h"

namespace platform::plist {

namespace {

constexpr std::string_view header = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                                    "<plist version=\"1.0\">\n";
constexpr std::string_view footer = "</plist>\n";

// Deeper than this, lines are not indented further: people no longer count the levels there, and a
// list must not become much larger than what is in it.
constexpr std::size_t deepestIndent = 8;

// ---- What can be written

bool isControl(char c) {
    return static_cast<unsigned char>(c) < 0x20 && c != '\t' && c != '\n' && c != '\r';
}

// Production 2 (Char) of XML 1.0: besides controls it forbids U+FFFE and U+FFFF.
bool isXmlText(std::string_view text) {
    return isUtf8(text) && std::ranges::none_of(text, isControl) &&
           !text.contains("\xef\xbf\xbe") && !text.contains("\xef\xbf\xbf");
}

const char* objectionTo(std::string_view text) {
    return isXmlText(text) ? nullptr : "text with a character that XML cannot hold";
}

const char* objectionTo(const Value& value);

const char* objectionTo(const Dictionary& dictionary) {
    for (const DictionaryEntry& entry : dictionary) {
        if (const char* const objection = objectionTo(entry.key.view()))
            return objection;
        if (const char* const objection = objectionTo(entry.value))
            return objection;
    }
    return nullptr;
}

const char* objectionTo(const Array& array) {
    for (const Value& item : array) {
        if (const char* const objection = objectionTo(item))
            return objection;
    }
    return nullptr;
}

// Nothing for what can be written.
const char* objectionTo(const Value& value) {
    switch (value.kind()) {
    case Value::Kind::boolean:
    case Value::Kind::signedInteger:
    case Value::Kind::unsignedInteger:
    case Value::Kind::data:
        return nullptr;
    case Value::Kind::real:
        return std::isfinite(*value.real()) ? nullptr : "a number that is not finite";
    case Value::Kind::date:
        return hasDateText(*value.date()) ? nullptr : "a date outside the years 0 to 9999";
    case Value::Kind::string:
        return objectionTo(*value.string());
    case Value::Kind::array:
        return objectionTo(*value.array());
    case Value::Kind::dictionary:
        return objectionTo(*value.dictionary());
    case Value::Kind::null:
    case Value::Kind::uuid:
    case Value::Kind::url:
    case Value::Kind::encoded:
        break;
    }
    return "a value of a kind that property lists do not have";
}

// ---- Writing

// Writes one value after the other into `out`. Lives for one call. REQUIRES: what it gets can be
// written
class Writer {
public:
    void write(const Value& value, std::size_t level);

    std::string out{header};

private:
    void indent(std::size_t level) { out.append(std::min(level, deepestIndent), '\t'); }

    void element(std::string_view name, std::string_view content) {
        out.append("<").append(name).append(">").append(content);
        out.append("</").append(name).append(">\n");
    }

    void textElement(std::string_view name, std::string_view text);
    void array(const Array& array, std::size_t level);
    void dictionary(const Dictionary& dictionary, std::size_t level);
};

// What markup is made of, and what readers take for a line's end.
const char* entityFor(char c) {
    switch (c) {
    case '&':
        return "&amp;";
    case '<':
        return "&lt;";
    case '>':
        return "&gt;";
    case '\r':
        return "&#13;";
    default:
        return nullptr;
    }
}

void Writer::textElement(std::string_view name, std::string_view text) {
    out.append("<").append(name).append(">");
    std::size_t from = 0;
    for (std::size_t at = 0; at < text.size(); ++at) {
        if (const char* const entity = entityFor(text[at])) {
            out.append(text.substr(from, at - from)).append(entity);
            from = at + 1;
        }
    }
    out.append(text.substr(from)).append("</").append(name).append(">\n");
}

void Writer::array(const Array& array, std::size_t level) {
    if (array.empty()) {
        out += "<array/>\n";
        return;
    }
    out += "<array>\n";
    for (const Value& item : array)
        write(item, level + 1);
    indent(level);
    out += "</array>\n";
}

void Writer::dictionary(const Dictionary& dictionary, std::size_t level) {
    if (dictionary.empty()) {
        out += "<dict/>\n";
        return;
    }
    out += "<dict>\n";
    for (const DictionaryEntry& entry : dictionary) {
        indent(level + 1);
        textElement("key", entry.key.view());
        write(entry.value, level + 1);
    }
    indent(level);
    out += "</dict>\n";
}

void Writer::write(const Value& value, std::size_t level) {
    indent(level);
    switch (value.kind()) {
    case Value::Kind::boolean:
        out += *value.boolean() ? "<true/>\n" : "<false/>\n";
        return;
    case Value::Kind::signedInteger:
        return element("integer", std::to_string(*value.signedInteger()));
    case Value::Kind::unsignedInteger:
        return element("integer", std::to_string(*value.unsignedInteger()));
    case Value::Kind::real:
        return element("real", realText(*value.real()));
    case Value::Kind::string:
        return textElement("string", *value.string());
    case Value::Kind::date:
        return element("date", dateText(*value.date()));
    case Value::Kind::data:
        return element("data", dataText(*value.data()));
    case Value::Kind::array:
        return array(*value.array(), level);
    case Value::Kind::dictionary:
        return dictionary(*value.dictionary(), level);
    case Value::Kind::null:
    case Value::Kind::uuid:
    case Value::Kind::url:
    case Value::Kind::encoded:
        assert(false);
    }
}

} // namespace

std::optional<Error> objectionToXml(const Value& value) {
    const char* const objection = objectionTo(value);
    return objection ? std::optional(corrupt(std::string("property list: ") + objection))
                     : std::nullopt;
}

std::expected<std::string, Error> writeXml(const Value& value) {
    if (auto objection = objectionToXml(value))
        return std::unexpected(std::move(*objection));
    Writer writer;
    writer.write(value, 0);
    writer.out += footer;
    return std::move(writer.out);
}

} // namespace platform::plist
