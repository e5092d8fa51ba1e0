#include <cstdio>

#include "platform/value/Hex.h"
#include "platform/value/Value.h"

namespace platform {

namespace {

constexpr std::size_t shownDataBytes = 16;

void append(std::string& out, const Value& value, bool nested);

void appendQuoted(std::string& out, std::string_view text) {
    out += '"';
    for (const char c : text) {
        if (c == '"' || c == '\\')
            out += '\\';
        out += c;
    }
    out += '"';
}

void appendReal(std::string& out, double number) {
    char room[32];
    const int length = std::snprintf(room, sizeof room, "%.15g", number);
    out.append(room, static_cast<std::size_t>(length));
}

void appendData(std::string& out, const Data& data) {
    const std::string_view bytes = data.bytes.view();
    out += "<data ";
    out += std::to_string(bytes.size());
    out += " bytes:";
    for (const char c : bytes.substr(0, shownDataBytes)) {
        out += ' ';
        appendHex(out, static_cast<unsigned char>(c));
    }
    if (bytes.size() > shownDataBytes)
        out += " ...";
    out += '>';
}

void appendArray(std::string& out, const Array& array) {
    out += '[';
    for (const Value& item : array) {
        if (&item != array.begin())
            out += ", ";
        append(out, item, true);
    }
    out += ']';
}

void appendDictionary(std::string& out, const Dictionary& dictionary) {
    out += '{';
    for (const DictionaryEntry& entry : dictionary) {
        if (&entry != dictionary.begin())
            out += ", ";
        appendQuoted(out, entry.key.view());
        out += ": ";
        append(out, entry.value, true);
    }
    out += '}';
}

void appendEncoded(std::string& out, const Encoded& encoded) {
    std::size_t size = 0;
    for (const SharedBytes& piece : *encoded.pieces)
        size += piece.size();
    out += "<record ";
    out += std::to_string(size);
    out += " bytes>";
}

void append(std::string& out, const Value& value, bool nested) {
    switch (value.kind()) {
    case Value::Kind::null:
        out += "null";
        return;
    case Value::Kind::boolean:
        out += *value.boolean() ? "true" : "false";
        return;
    case Value::Kind::signedInteger:
        out += std::to_string(*value.signedInteger());
        return;
    case Value::Kind::unsignedInteger:
        out += std::to_string(*value.unsignedInteger());
        return;
    case Value::Kind::real:
        appendReal(out, *value.real());
        return;
    case Value::Kind::string:
        if (nested) {
            appendQuoted(out, *value.string());
        } else {
            out += *value.string();
        }
        return;
    case Value::Kind::date:
        out += "<date ";
        appendReal(out, value.date()->secondsSinceEpoch);
        out += '>';
        return;
    case Value::Kind::data:
        appendData(out, *value.data());
        return;
    case Value::Kind::uuid:
        out += value.uuid()->text();
        return;
    case Value::Kind::url:
        out += value.url()->text.view();
        return;
    case Value::Kind::array:
        appendArray(out, *value.array());
        return;
    case Value::Kind::dictionary:
        appendDictionary(out, *value.dictionary());
        return;
    case Value::Kind::encoded:
        appendEncoded(out, *value.encoded());
        return;
    }
}

} // namespace

std::string describe(const Value& value) {
    std::string out;
    append(out, value, false);
    return out;
}

} // namespace platform
