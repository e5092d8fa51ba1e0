#include "platform/log/Render.h"

#include <charconv>
#include <cstdint>
#include <cstring>
#include <optional>
#include <system_error>

#include "platform/value/Hex.h"

namespace platform::log {

namespace {

constexpr std::string_view privateText = "<private>";

struct Directive {
    std::string_view text; // from "%" to the conversion
    std::string_view marker;
    std::string_view precision;
    char conversion = 0;
    bool hasLength = false;

    [[nodiscard]] bool known() const {
        if (conversion == 'P')
            return marker == "uuid_t" && precision == ".16" && !hasLength;
        if (!precision.empty())
            return false;
        if (conversion == '@' || conversion == 's' || conversion == 'p')
            return !hasLength;
        return conversion != 0 && std::string_view("diux").find(conversion) != std::string::npos;
    }

    [[nodiscard]] bool isPublic() const {
        return marker == "public" || marker == "errno" || conversion == 'p' || conversion == 'P';
    }
};

// The directive at the front of `format`, which begins with "%".
Directive parseDirective(std::string_view format) {
    Directive found;
    std::size_t at = 1;
    const auto here = [&] { return at < format.size() ? format[at] : '\0'; };
    if (here() == '{') {
        const auto close = format.find('}', at);
        if (close == std::string_view::npos)
            return {.text = format.substr(0, 1)};
        found.marker = format.substr(at + 1, close - at - 1);
        at = close + 1;
    }
    const std::size_t precisionStart = at;
    if (here() == '.') {
        do {
            ++at;
        } while (here() >= '0' && here() <= '9');
    }
    found.precision = format.substr(precisionStart, at - precisionStart);
    for (; here() == 'l' || here() == 'z'; ++at)
        found.hasLength = true;
    found.conversion = here();
    found.text = format.substr(0, std::min(at + 1, format.size()));
    return found;
}

void appendEscapedByte(std::string& out, char c) {
    switch (c) {
    case '\n':
        out += "\\n";
        return;
    case '\r':
        out += "\\r";
        return;
    case '\t':
        out += "\\t";
        return;
    default:
        out += "\\x";
        appendHex(out, static_cast<unsigned char>(c));
    }
}

// How many bytes at the start of `text` surely need no escape, in steps of eight: of plain ASCII
// without controls. (Adding 1 sets the high bit of 0x7f; taking 0x20 away, that of what is less.)
std::size_t plainPrefix(std::string_view text) {
    constexpr std::uint64_t ones = 0x0101010101010101;
    constexpr std::uint64_t highBits = 0x80 * ones;
    std::size_t at = 0;
    for (; at + sizeof(std::uint64_t) <= text.size(); at += sizeof(std::uint64_t)) {
        std::uint64_t eight = 0;
        std::memcpy(&eight, text.data() + at, sizeof eight);
        if ((eight | (eight + ones) | (eight - 0x20 * ones)) & highBits)
            break;
    }
    return at;
}

// True for U+0080 to U+009F, which a terminal may obey like escape sequences.
bool isWideControl(std::string_view text, std::size_t at) {
    return text[at] == '\xc2' && at + 1 < text.size() &&
           (static_cast<unsigned char>(text[at + 1]) & 0xe0) == 0x80;
}

void appendEscaped(std::string& out, std::string_view text) {
    std::size_t plainStart = 0;
    const auto appendPlain = [&](std::size_t end) {
        out.append(text.substr(plainStart, end - plainStart));
    };
    for (std::size_t i = plainPrefix(text); i < text.size(); ++i) {
        const char c = text[i];
        const bool wide = isWideControl(text, i);
        if (!wide && static_cast<unsigned char>(c) >= 0x20 && c != '\x7f')
            continue;
        appendPlain(i);
        appendEscapedByte(out, c);
        if (wide)
            appendEscapedByte(out, text[++i]);
        plainStart = i + 1;
    }
    appendPlain(text.size());
}

template <class T>
void appendNumber(std::string& out, T number, int base = 10) {
    char room[24];
    const auto end = std::to_chars(room, room + sizeof room, number, base).ptr;
    out.append(room, end);
}

// How arguments appear in what is made of them.
struct Style {
    bool showPrivate;
    bool escape;
};

void appendTextual(std::string& out, std::string_view text, const Style& style) {
    if (style.escape) {
        appendEscaped(out, text);
    } else {
        out += text;
    }
}

void appendArgument(std::string& out, const Argument& argument, char conversion,
                    const Style& style) {
    switch (argument.kind()) {
    case Argument::Kind::signedNumber:
    case Argument::Kind::unsignedNumber:
        if (conversion == 'x') {
            appendNumber(out, argument.number(), 16);
        } else if (argument.kind() == Argument::Kind::signedNumber) {
            appendNumber(out, static_cast<std::int64_t>(argument.number()));
        } else {
            appendNumber(out, argument.number());
        }
        return;
    case Argument::Kind::pointer:
        out += "0x";
        appendNumber(out, argument.number(), 16);
        return;
    case Argument::Kind::text:
        appendTextual(out, argument.text(), style);
        return;
    case Argument::Kind::thing:
        appendTextual(out, argument.description(), style);
        return;
    }
}

void appendErrno(std::string& out, const Argument& argument) {
    const auto number = static_cast<int>(argument.number());
    appendNumber(out, number);
    out += ' ';
    out += std::generic_category().message(number);
}

void appendUuid(std::string& out, const Argument& argument, const Style& style) {
    const auto uuid = Uuid::fromBytes(std::as_bytes(std::span(argument.text())));
    if (argument.kind() == Argument::Kind::text && uuid) {
        out += uuid->text();
    } else {
        appendArgument(out, argument, '@', style);
    }
}

void appendDirective(std::string& out, const Directive& directive, const Argument& argument,
                     const Style& style) {
    if (!style.showPrivate && !directive.isPublic()) {
        out += privateText;
    } else if (directive.conversion == 'P') {
        appendUuid(out, argument, style);
    } else if (directive.marker == "errno") {
        appendErrno(out, argument);
    } else {
        appendArgument(out, argument, directive.conversion, style);
    }
}

void renderTo(std::string& out, const char* format, std::span<const Argument> args,
              const Style& style) {
    std::string_view rest = format;
    std::size_t next = 0;
    for (;;) {
        const auto percent = rest.find('%');
        out.append(rest.substr(0, percent));
        if (percent == std::string_view::npos)
            return;
        rest.remove_prefix(percent);
        if (rest.starts_with("%%")) {
            out += '%';
            rest.remove_prefix(2);
            continue;
        }
        const Directive directive = parseDirective(rest);
        if (directive.known() && next < args.size()) {
            appendDirective(out, directive, args[next++], style);
        } else {
            out.append(directive.text);
        }
        rest.remove_prefix(directive.text.size());
    }
}

} // namespace

void renderLineTo(std::string& out, const char* format, std::span<const Argument> args,
                  bool showPrivate) {
    renderTo(out, format, args, {.showPrivate = showPrivate, .escape = true});
}

std::string renderLine(const char* format, std::span<const Argument> args, bool showPrivate) {
    std::string out;
    renderLineTo(out, format, args, showPrivate);
    return out;
}

std::string renderTextOf(const char* format, std::span<const Argument> args) {
    std::string out;
    renderTo(out, format, args, {.showPrivate = true, .escape = false});
    return out;
}

} // namespace platform::log
