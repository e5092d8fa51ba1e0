#include "Zephrin/FileURL.h"

#include <algorithm>

namespace {

constexpr std::string_view schemePrefix = "file:";
constexpr std::string_view localHost = "localhost";

char lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool equalsIgnoringCase(std::string_view a, std::string_view lowerCase) {
    return std::ranges::equal(a, lowerCase, {}, lower);
}

int digitValue(char c) {
    const char l = lower(c);
    if (l >= '0' && l <= '9')
        return l - '0';
    return l >= 'a' && l <= 'f' ? l - 'a' + 10 : -1;
}

std::optional<std::string> percentDecoded(std::string_view text) {
    std::string decoded;
    for (std::size_t i = 0; i < text.size(); ++i) {
        char c = text[i];
        if (c == '%') {
            if (i + 2 >= text.size())
                return std::nullopt;
            const int high = digitValue(text[i + 1]);
            const int low = digitValue(text[i + 2]);
            if (high < 0 || low < 0)
                return std::nullopt;
            c = static_cast<char>(high * 16 + low);
            i += 2;
        }
        if (c == '\0')
            return std::nullopt;
        decoded += c;
    }
    return decoded;
}

// What RFC 3986 lets stand in a path as it is.
bool staysInPath(char c) {
    const char l = lower(c);
    return (l >= 'a' && l <= 'z') || (c >= '0' && c <= '9') ||
           std::string_view("/-._~!$&'()*+,;=:@").find(c) != std::string_view::npos;
}

} // namespace

std::optional<std::string> pathFromFileURL(std::string_view url) {
    if (!equalsIgnoringCase(url.substr(0, schemePrefix.size()), schemePrefix))
        return std::nullopt;
    std::string_view rest = url.substr(schemePrefix.size());
    rest = rest.substr(0, rest.find_first_of("?#"));
    if (rest.starts_with("//")) {
        rest.remove_prefix(2);
        const std::string_view host = rest.substr(0, rest.find('/'));
        if (!host.empty() && !equalsIgnoringCase(host, localHost))
            return std::nullopt;
        rest.remove_prefix(host.size());
    }
    if (!rest.starts_with('/'))
        return std::nullopt;
    auto path = percentDecoded(rest);
    while (path && path->size() > 1 && path->back() == '/')
        path->pop_back();
    return path;
}

std::string fileURLFromPath(std::string_view path) {
    static constexpr char digits[] = "0123456789ABCDEF";
    std::string url(schemePrefix);
    url += "//";
    for (const char c : path) {
        if (staysInPath(c)) {
            url += c;
            continue;
        }
        const auto byte = static_cast<unsigned char>(c);
        url += '%';
        url += digits[byte >> 4];
        url += digits[byte & 0x0f];
    }
    return url;
}
