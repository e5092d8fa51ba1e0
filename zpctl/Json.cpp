#include "zpctl/Json.h"

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <limits>
#include <string_view>

#include <nlohmann/json.hpp>

namespace zpctl {

namespace {

using Json = nlohmann::ordered_json;
using platform::Value;

std::string base64(std::string_view bytes) {
    static constexpr char alphabet[] =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text;
    text.reserve((bytes.size() + 2) / 3 * 4);
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        std::uint32_t group = 0;
        for (std::size_t k = i; k < i + 3; ++k)
            group = group << 8 | (k < bytes.size() ? static_cast<unsigned char>(bytes[k]) : 0);
        const std::size_t given = std::min<std::size_t>(3, bytes.size() - i);
        for (std::size_t k = 0; k < 4; ++k)
            text += k <= given ? alphabet[group >> (18 - 6 * k) & 63] : '=';
    }
    return text;
}

Json arrayToJson(const platform::Array& array) {
    Json json = Json::array();
    for (const Value& value : array)
        json.push_back(toJson(value));
    return json;
}

Json dictionaryToJson(const platform::Dictionary& dictionary) {
    Json json = Json::object();
    for (const auto& [key, value] : dictionary)
        json[std::string(key.view())] = toJson(value);
    return json;
}

} // namespace

std::string dateText(platform::Date date) {
    constexpr double lastOfRange = 253402300799.0; // the end of the year 9999
    if (!(std::abs(date.secondsSinceEpoch) <= lastOfRange))
        return "out of range";
    const auto milliseconds =
        static_cast<std::int64_t>(std::floor(date.secondsSinceEpoch * 1000 + 0.5));
    const std::int64_t fraction = (milliseconds % 1000 + 1000) % 1000;
    const std::time_t seconds = (milliseconds - fraction) / 1000;
    std::tm parts{};
    if (!gmtime_r(&seconds, &parts))
        return "out of range";
    char text[40];
    std::size_t size = std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &parts);
    if (fraction)
        size += static_cast<std::size_t>(
            std::snprintf(text + size, sizeof text - size, ".%03d", static_cast<int>(fraction)));
    return std::string(text, size) + 'Z';
}

Json toJson(const Value& value) {
    switch (value.kind()) {
    case Value::Kind::boolean:
        return *value.boolean();
    case Value::Kind::signedInteger:
        return *value.signedInteger();
    case Value::Kind::unsignedInteger:
        return *value.unsignedInteger();
    case Value::Kind::real:
        return *value.real();
    case Value::Kind::string:
        return *value.string();
    case Value::Kind::date:
        return dateText(*value.date());
    case Value::Kind::data:
        return base64(value.data()->bytes.view());
    case Value::Kind::uuid:
        return value.uuid()->text();
    case Value::Kind::url:
        return value.url()->text.view();
    case Value::Kind::array:
        return arrayToJson(*value.array());
    case Value::Kind::dictionary:
        return dictionaryToJson(*value.dictionary());
    case Value::Kind::null:
    case Value::Kind::encoded: // never reaches a client: the library decodes records
        return nullptr;
    }
    return nullptr;
}

std::string jsonText(const Json& json) {
    constexpr int indentation = 2;
    constexpr bool asciiOnly = true; // so that control characters of all sorts are escaped
    return json.dump(indentation, ' ', asciiOnly, Json::error_handler_t::replace) + '\n';
}

} // namespace zpctl
