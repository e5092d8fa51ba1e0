#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "platform/value/SharedBytes.h"
#include "platform/value/Uuid.h"

namespace platform {

class Value;
struct DictionaryEntry;

struct Date {
    double secondsSinceEpoch = 0; // Unix epoch, UTC
    friend bool operator==(const Date&, const Date&) = default;
};

struct Url {
    SharedBytes text; // absolute string form, UTF-8
    friend bool operator==(const Url&, const Url&) = default;
};

struct Data {
    SharedBytes bytes;
    friend bool operator==(const Data&, const Data&) = default;
};

// An immutable, shared list of values. Copies share; append copies first when shared.
class Array {
public:
    Array() = default;
    Array(std::initializer_list<Value> values);
    explicit Array(std::vector<Value> values);

    [[nodiscard]] std::size_t size() const noexcept;

    [[nodiscard]] bool empty() const noexcept { return size() == 0; }

    [[nodiscard]] const Value* begin() const noexcept;
    [[nodiscard]] const Value* end() const noexcept;
    [[nodiscard]] const Value& operator[](std::size_t index) const noexcept;
    void append(Value value);

    friend bool operator==(const Array& a, const Array& b);

private:
    std::shared_ptr<std::vector<Value>> items_;
};

// An immutable, shared map of text keys to values, kept in key order: enumeration and encoding
// are the same for equal dictionaries. Copies share; a change copies first when shared.
class Dictionary {
public:
    Dictionary() = default;
    Dictionary(std::initializer_list<std::pair<std::string_view, Value>> entries);
    // Takes entries in any order; of entries with equal keys the last one stays.
    explicit Dictionary(std::vector<DictionaryEntry> entries);

    [[nodiscard]] std::size_t size() const noexcept;

    [[nodiscard]] bool empty() const noexcept { return size() == 0; }

    [[nodiscard]] const DictionaryEntry* begin() const noexcept;
    [[nodiscard]] const DictionaryEntry* end() const noexcept;
    [[nodiscard]] const Value* find(std::string_view key) const noexcept;
    // The same for a value that must be of this type; another counts as absent.
    [[nodiscard]] const Array* findArray(std::string_view key) const noexcept;
    [[nodiscard]] const Dictionary* findDictionary(std::string_view key) const noexcept;

    [[nodiscard]] bool contains(std::string_view key) const noexcept { return find(key); }

    void set(std::string_view key, Value value);
    void set(const SharedBytes& key, Value value);
    void remove(std::string_view key);

    // True when both are the very same shared object (or both empty): a cheap test of "unchanged".
    [[nodiscard]] bool sameObject(const Dictionary& other) const noexcept {
        return entries_ == other.entries_;
    }

    friend bool operator==(const Dictionary& a, const Dictionary& b);

private:
    std::vector<DictionaryEntry>& unshared();

    std::shared_ptr<std::vector<DictionaryEntry>> entries_;
};

// A value already in its wire encoding: one complete CBOR item, in pieces that are shared with
// whoever encoded them. Exists only on the way out (the "matches" of a reply); it equals nothing
// but itself and no typed getter answers for it.
struct Encoded {
    std::shared_ptr<const std::vector<SharedBytes>> pieces;
    friend bool operator==(const Encoded&, const Encoded&) = default;
};

// One rich value of any kind that crosses the wire or stands in a property list. Small (a tag
// and a pointer or scalar), cheap to copy, immutable once shared. Typed getters answer nothing on
// another kind. Values may be read from any number of threads; a single Value object is not locked.
class Value {
public:
    enum class Kind : std::uint8_t {
        null,
        boolean,
        signedInteger,
        unsignedInteger,
        real,
        string,
        date,
        data,
        uuid,
        url,
        array,
        dictionary,
        encoded
    };

    Value() = default;

    Value(std::nullptr_t) {}

    Value(std::same_as<bool> auto b) : held_(b) {}

    template <std::signed_integral T>
    Value(T n) : held_(integer(n)) {}

    template <std::unsigned_integral T>
        requires(!std::same_as<T, bool>)
    Value(T n) : held_(static_cast<std::uint64_t>(n)) {}

    Value(double d) : held_(d) {}

    Value(const char* text) : Value(std::string_view(text)) {}

    Value(std::string_view text) : held_(Text{SharedBytes(text)}) {}

    Value(const std::string& text) : Value(std::string_view(text)) {}

    Value(Date date) : held_(date) {}

    Value(Data data) : held_(std::move(data)) {}

    Value(const Uuid& uuid) : held_(uuid) {}

    Value(Url url) : held_(std::move(url)) {}

    Value(Array array) : held_(std::move(array)) {}

    Value(Dictionary dictionary) : held_(std::move(dictionary)) {}

    Value(Encoded encoded) : held_(std::move(encoded)) {}

    [[nodiscard]] static Value text(SharedBytes shared) {
        return Value(Held(Text{std::move(shared)}));
    }

    [[nodiscard]] Kind kind() const noexcept { return static_cast<Kind>(held_.index()); }

    [[nodiscard]] bool isNull() const noexcept { return kind() == Kind::null; }

    // Boolean, signed, unsigned or real: a boolean is a number where a number is asked for.
    [[nodiscard]] bool isNumber() const noexcept {
        return kind() >= Kind::boolean && kind() <= Kind::real;
    }

    [[nodiscard]] std::optional<bool> boolean() const noexcept;
    [[nodiscard]] std::optional<std::int64_t> signedInteger() const noexcept;
    // Answers for nothing but an integer >= 0 that was given or decoded as one.
    [[nodiscard]] std::optional<std::uint64_t> unsignedInteger() const noexcept;
    [[nodiscard]] std::optional<double> real() const noexcept;
    [[nodiscard]] std::optional<std::string_view> string() const noexcept;
    [[nodiscard]] const SharedBytes* sharedString() const noexcept;
    [[nodiscard]] std::optional<Date> date() const noexcept;
    [[nodiscard]] const Data* data() const noexcept;
    [[nodiscard]] std::optional<Uuid> uuid() const noexcept;
    [[nodiscard]] const Url* url() const noexcept;
    [[nodiscard]] const Array* array() const noexcept;
    [[nodiscard]] const Dictionary* dictionary() const noexcept;
    [[nodiscard]] const Encoded* encoded() const noexcept;

    // Any number as a whole number, truncated toward zero and kept within the range; nothing for
    // other kinds and for a real that is not a number.
    [[nodiscard]] std::optional<std::int64_t> integerValue() const noexcept;
    // Any number as a truth value (not 0); nothing for other kinds.
    [[nodiscard]] std::optional<bool> booleanValue() const noexcept;

    // Value equality with the booleans: true equals 1, false equals 0, whatever the number's kind.
    [[nodiscard]] bool equalsTrue() const noexcept { return isNumber() && *this == Value(true); }

    [[nodiscard]] bool equalsFalse() const noexcept { return isNumber() && *this == Value(false); }

    // Numbers compare by numeric value across kinds (exactly: no rounding of large integers);
    // everything else by kind and content.
    friend bool operator==(const Value& a, const Value& b) noexcept;

private:
    struct Text {
        SharedBytes bytes;
        friend bool operator==(const Text&, const Text&) = default;
    };

    using Held = std::variant<std::nullptr_t, bool, std::int64_t, std::uint64_t, double, Text, Date,
                              Data, Uuid, Url, Array, Dictionary, Encoded>;

    explicit Value(Held held) : held_(std::move(held)) {}

    static Held integer(std::int64_t n) {
        return n < 0 ? Held(n) : Held(static_cast<std::uint64_t>(n));
    }

    Held held_;
};

struct DictionaryEntry {
    SharedBytes key;
    Value value;
    friend bool operator==(const DictionaryEntry&, const DictionaryEntry&) = default;
};

// One line of text for people: log arguments and probe texts. Strings at the top level stand
// bare, nested ones in quotes; data is shown by its first bytes and its size.
[[nodiscard]] std::string describe(const Value& value);

[[nodiscard]] inline std::string describe(const Dictionary& dictionary) {
    return describe(Value(dictionary));
}

} // namespace platform
