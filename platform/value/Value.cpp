#include "platform/value/Value.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <limits>

namespace platform {

namespace {

const Value nullValue;

bool keyBefore(const DictionaryEntry& entry, std::string_view key) {
    return entry.key.view() < key;
}

// Stable. Most dictionaries are a handful of entries, for which the library would take memory.
void sortByKey(std::vector<DictionaryEntry>& entries) {
    constexpr std::size_t handful = 16;
    const auto keyOf = [](const DictionaryEntry& entry) { return entry.key.view(); };
    if (entries.size() > handful) {
        std::ranges::stable_sort(entries, {}, keyOf);
        return;
    }
    for (auto next = entries.begin(); next != entries.end(); ++next) {
        const auto place = std::ranges::upper_bound(entries.begin(), next, keyOf(*next), {}, keyOf);
        if (place != next)
            std::rotate(place, next, std::next(next));
    }
}

} // namespace

// ---- Array

Array::Array(std::initializer_list<Value> values) : Array(std::vector<Value>(values)) {}

Array::Array(std::vector<Value> values) {
    if (!values.empty())
        items_ = std::make_shared<std::vector<Value>>(std::move(values));
}

std::size_t Array::size() const noexcept {
    return items_ ? items_->size() : 0;
}

const Value* Array::begin() const noexcept {
    return items_ ? items_->data() : nullptr;
}

const Value* Array::end() const noexcept {
    return items_ ? items_->data() + items_->size() : nullptr;
}

const Value& Array::operator[](std::size_t index) const noexcept {
    return index < size() ? (*items_)[index] : nullValue;
}

void Array::append(Value value) {
    if (!items_) {
        items_ = std::make_shared<std::vector<Value>>();
    } else if (items_.use_count() > 1) {
        items_ = std::make_shared<std::vector<Value>>(*items_);
    }
    items_->push_back(std::move(value));
}

bool operator==(const Array& a, const Array& b) {
    return a.items_ == b.items_ || std::equal(a.begin(), a.end(), b.begin(), b.end());
}

// ---- Dictionary

Dictionary::Dictionary(std::initializer_list<std::pair<std::string_view, Value>> entries) {
    std::vector<DictionaryEntry> list;
    list.reserve(entries.size());
    for (const auto& [key, value] : entries)
        list.push_back({SharedBytes(key), value});
    *this = Dictionary(std::move(list));
}

Dictionary::Dictionary(std::vector<DictionaryEntry> entries) {
    if (entries.empty())
        return;
    sortByKey(entries);
    // Of equal keys the last one stays: walk from the back, where it comes first.
    const auto repeated = std::unique(
        entries.rbegin(), entries.rend(),
        [](const DictionaryEntry& a, const DictionaryEntry& b) { return a.key == b.key; });
    entries.erase(entries.begin(), repeated.base());
    entries.shrink_to_fit();
    entries_ = std::make_shared<std::vector<DictionaryEntry>>(std::move(entries));
}

std::size_t Dictionary::size() const noexcept {
    return entries_ ? entries_->size() : 0;
}

const DictionaryEntry* Dictionary::begin() const noexcept {
    return entries_ ? entries_->data() : nullptr;
}

const DictionaryEntry* Dictionary::end() const noexcept {
    return entries_ ? entries_->data() + entries_->size() : nullptr;
}

const Value* Dictionary::find(std::string_view key) const noexcept {
    // Among a handful, lengths tell most keys apart; a search by order would compare each in full.
    constexpr std::size_t handful = 8;
    if (size() <= handful) {
        for (const DictionaryEntry& entry : *this) {
            if (entry.key.view() == key)
                return &entry.value;
        }
        return nullptr;
    }
    const auto* found = std::lower_bound(begin(), end(), key, keyBefore);
    return found != end() && found->key.view() == key ? &found->value : nullptr;
}

const Array* Dictionary::findArray(std::string_view key) const noexcept {
    const Value* const value = find(key);
    return value ? value->array() : nullptr;
}

const Dictionary* Dictionary::findDictionary(std::string_view key) const noexcept {
    const Value* const value = find(key);
    return value ? value->dictionary() : nullptr;
}

std::vector<DictionaryEntry>& Dictionary::unshared() {
    if (!entries_) {
        entries_ = std::make_shared<std::vector<DictionaryEntry>>();
    } else if (entries_.use_count() > 1) {
        entries_ = std::make_shared<std::vector<DictionaryEntry>>(*entries_);
    }
    return *entries_;
}

void Dictionary::set(std::string_view key, Value value) {
    set(SharedBytes(key), std::move(value));
}

void Dictionary::set(const SharedBytes& key, Value value) {
    auto& entries = unshared();
    const auto at = std::lower_bound(entries.begin(), entries.end(), key.view(), keyBefore);
    if (at != entries.end() && at->key == key) {
        at->value = std::move(value);
    } else {
        entries.insert(at, {key, std::move(value)});
    }
}

void Dictionary::remove(std::string_view key) {
    if (!find(key))
        return;
    auto& entries = unshared();
    entries.erase(std::lower_bound(entries.begin(), entries.end(), key, keyBefore));
    if (entries.empty())
        entries_.reset();
}

bool operator==(const Dictionary& a, const Dictionary& b) {
    return a.entries_ == b.entries_ || std::equal(a.begin(), a.end(), b.begin(), b.end());
}

// ---- Value: typed getters

namespace {

template <class T, class Held>
std::optional<T> getCopy(const Held& held) {
    const T* found = std::get_if<T>(&held);
    return found ? std::optional<T>(*found) : std::nullopt;
}

} // namespace

std::optional<bool> Value::boolean() const noexcept {
    return getCopy<bool>(held_);
}

std::optional<std::int64_t> Value::signedInteger() const noexcept {
    if (const auto* n = std::get_if<std::int64_t>(&held_))
        return *n;
    const auto* u = std::get_if<std::uint64_t>(&held_);
    if (!u || *u > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
        return {};
    return static_cast<std::int64_t>(*u);
}

std::optional<std::uint64_t> Value::unsignedInteger() const noexcept {
    return getCopy<std::uint64_t>(held_);
}

std::optional<double> Value::real() const noexcept {
    return getCopy<double>(held_);
}

const SharedBytes* Value::sharedString() const noexcept {
    const auto* text = std::get_if<Text>(&held_);
    return text ? &text->bytes : nullptr;
}

std::optional<std::string_view> Value::string() const noexcept {
    const SharedBytes* text = sharedString();
    return text ? std::optional(text->view()) : std::nullopt;
}

std::optional<Date> Value::date() const noexcept {
    return getCopy<Date>(held_);
}

const Data* Value::data() const noexcept {
    return std::get_if<Data>(&held_);
}

std::optional<Uuid> Value::uuid() const noexcept {
    return getCopy<Uuid>(held_);
}

const Url* Value::url() const noexcept {
    return std::get_if<Url>(&held_);
}

const Array* Value::array() const noexcept {
    return std::get_if<Array>(&held_);
}

const Dictionary* Value::dictionary() const noexcept {
    return std::get_if<Dictionary>(&held_);
}

const Encoded* Value::encoded() const noexcept {
    return std::get_if<Encoded>(&held_);
}

// ---- Value: numbers

namespace {

// 2^63 and 2^64 are exact as doubles; the largest integers are not.
constexpr double twoTo63 = 9223372036854775808.0;
constexpr double twoTo64 = 18446744073709551616.0;

std::int64_t saturated(double d) {
    if (d >= twoTo63)
        return std::numeric_limits<std::int64_t>::max();
    if (d < -twoTo63)
        return std::numeric_limits<std::int64_t>::min();
    return static_cast<std::int64_t>(d);
}

bool equalsReal(const Value& integer, double d) {
    if (d != std::trunc(d))
        return false; // also not a number and the infinities' differences
    if (const auto u = integer.unsignedInteger()) {
        return d >= 0 && d < twoTo64 && static_cast<std::uint64_t>(d) == *u;
    }
    if (const auto b = integer.boolean())
        return d == (*b ? 1.0 : 0.0);
    return d >= -twoTo63 && d < 0 && static_cast<std::int64_t>(d) == *integer.signedInteger();
}

bool equalNumbers(const Value& a, const Value& b) {
    const auto realA = a.real();
    const auto realB = b.real();
    if (realA && realB)
        return *realA == *realB;
    if (realA)
        return equalsReal(b, *realA);
    if (realB)
        return equalsReal(a, *realB);
    const auto asUnsigned = [](const Value& v) {
        const auto truth = v.boolean();
        return truth ? std::optional<std::uint64_t>(*truth) : v.unsignedInteger();
    };
    const auto unsignedA = asUnsigned(a);
    const auto unsignedB = asUnsigned(b);
    if (unsignedA || unsignedB)
        return unsignedA == unsignedB;
    return a.signedInteger() == b.signedInteger();
}

} // namespace

std::optional<std::int64_t> Value::integerValue() const noexcept {
    switch (kind()) {
    case Kind::boolean:
        return *boolean() ? 1 : 0;
    case Kind::signedInteger:
        return signedInteger();
    case Kind::unsignedInteger:
        return signedInteger().value_or(std::numeric_limits<std::int64_t>::max());
    case Kind::real:
        if (std::isnan(*real()))
            return std::nullopt;
        return saturated(*real());
    default:
        return std::nullopt;
    }
}

std::optional<bool> Value::booleanValue() const noexcept {
    if (!isNumber())
        return std::nullopt;
    return !equalsFalse();
}

bool operator==(const Value& a, const Value& b) noexcept {
    if (a.isNumber() && b.isNumber())
        return equalNumbers(a, b);
    if (a.kind() != b.kind())
        return false;
    return a.held_ == b.held_;
}

} // namespace platform
