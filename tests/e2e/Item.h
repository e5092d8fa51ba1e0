#pragma once

#include <cstdint>
#include <initializer_list>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace e2e {

// One CBOR data item as it stands on the wire, with tags kept as they are. Written for the tests
// alone, from the description of the wire, so that it cannot repeat a mistake of the daemon's own
// codec. A plain value; also serves as the value type of the property lists that the tests write.
class Item {
public:
    enum class Kind { null, boolean, number, negative, real, text, bytes, array, map, tag };
    using Pair = std::pair<std::string, Item>;

    Item() = default;

    Item(bool flag) : kind_(Kind::boolean), number_(flag ? 1 : 0) {}

    Item(int n) : Item(static_cast<std::int64_t>(n)) {}

    Item(std::int64_t n)
        : kind_(n < 0 ? Kind::negative : Kind::number),
          number_(n < 0 ? static_cast<std::uint64_t>(-1 - n) : static_cast<std::uint64_t>(n)) {}

    Item(std::uint64_t n) : kind_(Kind::number), number_(n) {}

    Item(double real) : kind_(Kind::real), real_(real) {}

    Item(const char* text) : Item(std::string(text)) {}

    Item(std::string text) : kind_(Kind::text), text_(std::move(text)) {}

    static Item bytes(std::string content);
    static Item array(std::vector<Item> items);
    static Item map(std::initializer_list<Pair> pairs);
    static Item tagged(std::uint64_t tag, Item content);
    static Item uuid(std::string_view text); // tag 37
    static Item url(std::string text);       // tag 32
    static Item date(double seconds);        // tag 1

    [[nodiscard]] Kind kind() const { return kind_; }

    [[nodiscard]] bool isNull() const { return kind_ == Kind::null; }

    // What the item holds; nothing of it (0, empty) when it is of another kind.
    [[nodiscard]] bool truth() const { return number_ != 0; }

    [[nodiscard]] std::uint64_t number() const { return number_; }

    [[nodiscard]] std::int64_t integer() const;

    [[nodiscard]] double real() const { return real_; }

    [[nodiscard]] const std::string& text() const { return text_; }

    [[nodiscard]] const std::vector<Item>& items() const { return items_; }

    [[nodiscard]] std::vector<std::string> keys() const;              // in the order of the wire
    [[nodiscard]] const Item& operator[](std::string_view key) const; // null when absent
    [[nodiscard]] bool has(std::string_view key) const;
    Item& set(std::string key, Item value); // at the end, or in the place of the old one
    Item& append(Item item);
    // A copy with every entry of `other` set; dictionaries within dictionaries are merged.
    [[nodiscard]] Item merged(const Item& other) const;

    // The item inside tag 24; throws when this is not a tag 24 of one whole item.
    [[nodiscard]] Item embedded() const;

    // Maps are equal in any order of their keys.
    friend bool operator==(const Item& a, const Item& b);
    friend std::ostream& operator<<(std::ostream& out, const Item& item);

private:
    friend std::string encode(const Item& item);
    friend class Decoder;

    Kind kind_ = Kind::null;
    std::uint64_t number_ = 0; // also the tag; for negative the argument n of -1-n
    double real_ = 0;
    std::string text_;
    std::vector<Item> items_; // a tag's one item; a map's values
    std::vector<std::string> keys_;
};

[[nodiscard]] std::string encode(const Item& item);
// Throws std::runtime_error on anything that is not exactly one item as the daemon may write it.
[[nodiscard]] Item decode(std::string_view bytes);

// The initial byte and argument of an item, for frames that no Item can express.
[[nodiscard]] std::string head(unsigned major, std::uint64_t argument);

} // namespace e2e
