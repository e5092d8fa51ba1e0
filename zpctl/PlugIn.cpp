#include "zpctl/PlugIn.h"

#include <cstdint>
#include <string_view>

namespace zpctl {

namespace {

using platform::Dictionary;
using platform::Value;

std::optional<std::string> textAt(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    const auto text = value ? value->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

Dictionary dictionaryAt(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    return value && value->dictionary() ? *value->dictionary() : Dictionary();
}

// In the words of "elect". The second 8 bits say nothing about the choice.
std::string electionIn(const Dictionary& annotations) {
    constexpr std::int64_t unusedBits = 0xff00;
    const Value* election = annotations.find("election");
    const std::int64_t number = election ? election->integerValue().value_or(0) : 0;
    switch (number & ~unusedBits) {
    case 0:
        return {};
    case 1:
        return "elected";
    case 2:
        return "not elected";
    default:
        return "election " + std::to_string(number);
    }
}

// "Cinema" of "/Applications/Cinema.app".
std::string bundleName(const std::string& path) {
    const std::string last = path.substr(path.rfind('/') + 1);
    return last.substr(0, last.rfind('.'));
}

std::optional<std::string> applicationNameIn(const Dictionary& form) {
    if (auto name = textAt(form, "localizedContainingDisplayName"))
        return name;
    const auto path = textAt(form, "containingPath");
    return path ? std::optional(bundleName(*path)) : std::nullopt;
}

bool booleanAt(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    return value && value->booleanValue().value_or(false);
}

} // namespace

PlugIn PlugIn::of(const Dictionary& form) {
    const std::string identifier = textAt(form, "identifier").value_or("");
    return {
        .identifier = identifier,
        .name =
            textAt(dictionaryAt(form, "bundleInfo"), "BQBundleDisplayName").value_or(identifier),
        .version = textAt(form, "version").value_or(""),
        .extensionPoint =
            textAt(dictionaryAt(form, "info"), "HXExtensionPointIdentifier").value_or(""),
        .uuid = textAt(form, "uuid").value_or(""),
        .path = textAt(form, "path").value_or(""),
        .election = electionIn(dictionaryAt(form, "annotations")),
        .onSystemVolume = booleanAt(form, "systemResident"),
        .applicationPath = textAt(form, "containingPath"),
        .applicationName = applicationNameIn(form),
    };
}

std::string counted(std::size_t count, const std::string& what) {
    return std::to_string(count) + ' ' + what + (count == 1 ? "" : "s");
}

} // namespace zpctl
