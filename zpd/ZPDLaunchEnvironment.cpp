#include "zpd/ZPDLaunchEnvironment.h"

using namespace std::string_view_literals;

namespace {

bool isName(std::string_view text) {
    return !text.empty() && text.find_first_of("=\0"sv) == std::string_view::npos;
}

bool isText(const platform::Value& value) {
    const auto text = value.string();
    return text && text->find('\0') == std::string_view::npos;
}

} // namespace

void ZPDLaunchEnvironment::add(std::string_view name, const platform::Value& value) {
    if (isName(name) && isText(value))
        entries_.push_back({platform::SharedBytes(name), value});
}

void ZPDLaunchEnvironment::add(const platform::Dictionary& entries) {
    for (const platform::DictionaryEntry& entry : entries) {
        if (isName(entry.key.view()) && isText(entry.value))
            entries_.push_back(entry);
    }
}
