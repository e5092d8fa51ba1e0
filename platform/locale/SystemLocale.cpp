#include "platform/locale/SystemLocale.h"

#include <algorithm>
#include <cstdlib>
#include <utility>

namespace platform {

namespace {

constexpr std::size_t largestFile = 64 * 1024;

std::string_view unquoted(std::string_view text) {
    if (text.size() >= 2 && (text.front() == '"' || text.front() == '\'') &&
        text.back() == text.front())
        return text.substr(1, text.size() - 2);
    return text;
}

std::string_view withoutBlanks(std::string_view line) {
    const auto first = line.find_first_not_of(" \t\r");
    if (first == std::string_view::npos)
        return {};
    return line.substr(first, line.find_last_not_of(" \t\r") - first + 1);
}

// The last assignment to LANG in a file of shell-like assignments.
std::optional<std::string> langIn(std::string_view content) {
    constexpr std::string_view name = "LANG=";
    std::optional<std::string> found;
    while (!content.empty()) {
        const auto end = std::min(content.find('\n'), content.size());
        const std::string_view line = withoutBlanks(content.substr(0, end));
        content.remove_prefix(std::min(end + 1, content.size()));
        if (line.starts_with(name))
            found = std::string(unquoted(line.substr(name.size())));
    }
    return found;
}

bool isAlphanumeric(char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isLowerCase(char c) {
    return c >= 'a' && c <= 'z';
}

} // namespace

std::string languageAndRegion(std::string_view localeName) {
    const std::string_view name = localeName.substr(0, localeName.find_first_of(".@"));
    const auto underscore = name.find('_');
    const std::string_view language = name.substr(0, underscore);
    if (language.size() < 2 || language.size() > 3 || !std::ranges::all_of(language, isLowerCase))
        return {};
    if (underscore == std::string_view::npos)
        return std::string(name);
    const std::string_view region = name.substr(underscore + 1);
    const bool sound = !region.empty() && std::ranges::all_of(region, isAlphanumeric);
    return std::string(sound ? name : language);
}

SystemLocale::SystemLocale(std::string path) : path_(std::move(path)), watch_(path_) {
    read();
}

std::string SystemLocale::current() {
    const std::lock_guard lock(mutex_);
    return current_;
}

bool SystemLocale::read() {
    stamp_ = stampOf(path_);
    const auto content = readRegularFile(path_, largestFile);
    auto name = content ? langIn(content->bytes) : std::nullopt;
    if (!name) {
        const char* variable = std::getenv("LANG");
        name = variable ? variable : "";
    }
    const std::lock_guard lock(mutex_);
    const std::string before = std::exchange(current_, languageAndRegion(*name));
    return before != current_;
}

void SystemLocale::handleEvents() {
    if (!watch_.handleEvents())
        return;
    const auto before = stamp_;
    const bool differs = read();
    if (handler_ && (differs || stamp_ != before))
        handler_();
}

} // namespace platform
