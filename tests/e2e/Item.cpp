#include "tests/e2e/Item.h"

#include <algorithm>
#include <bit>
#include <stdexcept>

namespace e2e {

Item Item::bytes(std::string content) {
    Item item(std::move(content));
    item.kind_ = Kind::bytes;
    return item;
}

Item Item::array(std::vector<Item> items) {
    Item item;
    item.kind_ = Kind::array;
    item.items_ = std::move(items);
    return item;
}

Item Item::map(std::initializer_list<Pair> pairs) {
    Item item;
    item.kind_ = Kind::map;
    for (const Pair& pair : pairs)
        item.set(pair.first, pair.second);
    return item;
}

Item Item::tagged(std::uint64_t tag, Item content) {
    Item item;
    item.kind_ = Kind::tag;
    item.number_ = tag;
    item.items_.push_back(std::move(content));
    return item;
}

Item Item::uuid(std::string_view text) {
    std::string digits(text);
    std::erase(digits, '-');
    std::string raw;
    for (std::size_t i = 0; i + 1 < digits.size(); i += 2)
        raw.push_back(static_cast<char>(std::stoi(digits.substr(i, 2), nullptr, 16)));
    return tagged(37, bytes(raw));
}

Item Item::url(std::string text) {
    return tagged(32, Item(std::move(text)));
}

Item Item::date(double seconds) {
    return tagged(1, Item(seconds));
}

std::int64_t Item::integer() const {
    const auto n = static_cast<std::int64_t>(number_);
    return kind_ == Kind::negative ? -1 - n : n;
}

std::vector<std::string> Item::keys() const {
    return keys_;
}

const Item& Item::operator[](std::string_view key) const {
    static const Item none;
    const auto found = std::find(keys_.begin(), keys_.end(), key);
    return found == keys_.end() ? none : items_[static_cast<std::size_t>(found - keys_.begin())];
}

bool Item::has(std::string_view key) const {
    return std::find(keys_.begin(), keys_.end(), key) != keys_.end();
}

Item& Item::set(std::string key, Item value) {
    const auto found = std::find(keys_.begin(), keys_.end(), key);
    if (found != keys_.end()) {
        items_[static_cast<std::size_t>(found - keys_.begin())] = std::move(value);
        return *this;
    }
    keys_.push_back(std::move(key));
    items_.push_back(std::move(value));
    return *this;
}

Item& Item::append(Item item) {
    items_.push_back(std::move(item));
    return *this;
}

Item Item::merged(const Item& other) const {
    Item result = *this;
    for (const std::string& key : other.keys()) {
        const Item& theirs = other[key];
        const bool both = theirs.kind() == Kind::map && (*this)[key].kind() == Kind::map;
        result.set(key, both ? (*this)[key].merged(theirs) : theirs);
    }
    return result;
}

Item Item::embedded() const {
    if (kind_ != Kind::tag || number_ != 24 || items_[0].kind_ != Kind::bytes)
        throw std::runtime_error("not an embedded item (tag 24)");
    return decode(items_[0].text_);
}

bool operator==(const Item& a, const Item& b) {
    if (a.kind_ != b.kind_ || a.items_.size() != b.items_.size())
        return false;
    if (a.kind_ != Item::Kind::map) {
        return a.number_ == b.number_ && a.real_ == b.real_ && a.text_ == b.text_ &&
               a.items_ == b.items_;
    }
    return std::all_of(a.keys_.begin(), a.keys_.end(),
                       [&](const std::string& key) { return b.has(key) && a[key] == b[key]; });
}

std::string head(unsigned major, std::uint64_t argument) {
    const auto initial = [&](unsigned low) { return std::string(1, char(major << 5 | low)); };
    if (argument < 24)
        return initial(static_cast<unsigned>(argument));
    const unsigned size = argument < 0x100 ? 0 : argument < 0x10000 ? 1 : argument >> 32 ? 3 : 2;
    std::string text = initial(24 + size);
    for (int shift = (8 << size) - 8; shift >= 0; shift -= 8)
        text.push_back(static_cast<char>(argument >> shift));
    return text;
}

std::string encode(const Item& item) {
    std::string text;
    switch (item.kind_) {
    case Item::Kind::null:
        return "\xf6";
    case Item::Kind::boolean:
        return item.number_ ? "\xf5" : "\xf4";
    case Item::Kind::number:
        return head(0, item.number_);
    case Item::Kind::negative:
        return head(1, item.number_);
    case Item::Kind::bytes:
        return head(2, item.text_.size()) + item.text_;
    case Item::Kind::text:
        return head(3, item.text_.size()) + item.text_;
    case Item::Kind::real:
        text = "\xfb";
        for (int shift = 56; shift >= 0; shift -= 8)
            text.push_back(static_cast<char>(std::bit_cast<std::uint64_t>(item.real_) >> shift));
        return text;
    case Item::Kind::array:
        text = head(4, item.items_.size());
        break;
    case Item::Kind::map:
        text = head(5, item.items_.size());
        break;
    case Item::Kind::tag:
        text = head(6, item.number_);
        break;
    }
    for (std::size_t i = 0; i < item.items_.size(); ++i) {
        if (item.kind_ == Item::Kind::map)
            text += encode(Item(item.keys_[i]));
        text += encode(item.items_[i]);
    }
    return text;
}

// Reads what the daemon may write: definite lengths, text keys each once, 64-bit floats, and the
// tags of the wire.
class Decoder {
public:
    explicit Decoder(std::string_view bytes) : rest_(bytes) {}

    Item whole() {
        Item item = next();
        if (!rest_.empty())
            throw std::runtime_error("bytes after the item");
        return item;
    }

private:
    std::string take(std::uint64_t size) {
        if (size > rest_.size())
            throw std::runtime_error("item cut short");
        std::string taken(rest_.substr(0, size));
        rest_.remove_prefix(size);
        return taken;
    }

    std::uint64_t unsignedOf(std::size_t size) {
        std::uint64_t n = 0;
        for (const char c : take(size))
            n = n << 8 | static_cast<unsigned char>(c);
        return n;
    }

    std::uint64_t argument(unsigned low) {
        if (low < 24)
            return low;
        if (low > 27)
            throw std::runtime_error("indefinite or reserved length");
        return unsignedOf(std::size_t{1} << (low - 24));
    }

    Item next() {
        const auto initial = static_cast<unsigned char>(take(1)[0]);
        const unsigned major = initial >> 5;
        const unsigned low = initial & 31;
        if (major == 7)
            return simple(low);
        const std::uint64_t n = argument(low);
        switch (major) {
        case 0:
            return Item(n);
        case 1:
            return Item(-1 - static_cast<std::int64_t>(n));
        case 2:
            return Item::bytes(take(n));
        case 3:
            return Item(take(n));
        case 4:
            return arrayOf(n);
        case 5:
            return mapOf(n);
        default:
            return tagOf(n);
        }
    }

    Item simple(unsigned low) {
        if (low == 20 || low == 21)
            return Item(low == 21);
        if (low == 22)
            return Item();
        if (low == 27)
            return Item(std::bit_cast<double>(unsignedOf(8)));
        throw std::runtime_error("a simple value that the wire does not have");
    }

    Item arrayOf(std::uint64_t count) {
        Item result = Item::array({});
        for (; count > 0; --count)
            result.items_.push_back(next());
        return result;
    }

    Item mapOf(std::uint64_t count) {
        Item result = Item::map({});
        for (; count > 0; --count) {
            const Item key = next();
            if (key.kind() != Item::Kind::text || result.has(key.text()))
                throw std::runtime_error("a key that is no text or stands twice");
            result.keys_.push_back(key.text());
            result.items_.push_back(next());
        }
        return result;
    }

    Item tagOf(std::uint64_t tag) {
        if (tag != 1 && tag != 24 && tag != 32 && tag != 37)
            throw std::runtime_error("a tag that the wire does not have");
        return Item::tagged(tag, next());
    }

    std::string_view rest_;
};

Item decode(std::string_view bytes) {
    return Decoder(bytes).whole();
}

std::ostream& operator<<(std::ostream& out, const Item& item) {
    out << (item.isNull() ? "null" : item.text());
    if (item.text().empty() && item.items().empty())
        out << (item.kind() == Item::Kind::real ? item.real() : double(item.integer()));
    for (std::size_t i = 0; i < item.items().size(); ++i)
        out << (i ? ", " : "(") << (item.keys_.empty() ? "" : item.keys_[i] + ": ")
            << item.items()[i];
    return out << (item.items().empty() ? "" : ")");
}

} // namespace e2e
