#include "platform/sandbox/SandboxGrant.h"

#include <array>
#include <charconv>
#include <vector>

#include "platform/value/Hex.h"

namespace platform {

namespace {

constexpr std::string_view tokenVersion = "zsx1";
constexpr std::string_view fileKind = "file";
constexpr std::string_view serviceKind = "service";

bool standsForItself(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
           std::string_view("-._~/").find(c) != std::string_view::npos;
}

void appendEncoded(std::string& out, std::string_view text) {
    for (const char c : text) {
        if (standsForItself(c)) {
            out += c;
        } else {
            out += '%';
            appendHex(out, static_cast<unsigned char>(c));
        }
    }
}

void appendFlags(std::string& out, std::uint32_t flags) {
    std::array<char, 8> room;
    out.append(room.data(), std::to_chars(room.data(), room.data() + room.size(), flags, 16).ptr);
}

template <class Number>
std::optional<Number> hexNumber(std::string_view text) {
    Number number{};
    const auto result = std::from_chars(text.data(), text.data() + text.size(), number, 16);
    const bool whole = result.ec == std::errc() && result.ptr == text.data() + text.size();
    return whole ? std::optional(number) : std::nullopt;
}

std::optional<std::string> decoded(std::string_view text) {
    constexpr std::size_t encodedSize = 3;
    std::string out;
    while (!text.empty()) {
        const bool encoded = text.front() == '%';
        const auto byte = encoded ? hexNumber<unsigned char>(text.substr(1, 2)) : std::nullopt;
        if (encoded && !byte)
            return std::nullopt;
        out += encoded ? static_cast<char>(*byte) : text.front();
        text.remove_prefix(encoded ? std::min(encodedSize, text.size()) : 1);
    }
    return out;
}

std::vector<std::string_view> fieldsOf(std::string_view text) {
    std::vector<std::string_view> fields;
    for (auto end = text.find(';'); end != std::string_view::npos; end = text.find(';')) {
        fields.push_back(text.substr(0, end));
        text.remove_prefix(end + 1);
    }
    fields.push_back(text);
    return fields;
}

} // namespace

std::string SandboxGrant::text() const {
    std::string text(tokenVersion);
    text += ';';
    appendEncoded(text, extensionClass);
    text += ';';
    appendFlags(text, flags);
    text.append(";").append(kind == Kind::file ? fileKind : serviceKind).append(";");
    appendEncoded(text, target);
    return text;
}

std::optional<SandboxGrant> SandboxGrant::parse(std::string_view text) {
    constexpr std::size_t fieldCount = 5;
    const auto fields = fieldsOf(text);
    if (fields.size() != fieldCount)
        return std::nullopt;
    auto extensionClass = decoded(fields[1]);
    const auto flags = hexNumber<std::uint32_t>(fields[2]);
    auto target = decoded(fields[4]);
    if (!extensionClass || !flags || !target)
        return std::nullopt;
    SandboxGrant grant{*std::move(extensionClass), *flags,
                       fields[3] == fileKind ? Kind::file : Kind::service, *std::move(target)};
    // There is one text for each grant.
    return grant.text() == text ? std::optional(std::move(grant)) : std::nullopt;
}

} // namespace platform
