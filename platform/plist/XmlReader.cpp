#include <array>
#include <climits>
#include <memory>
#include <optional>
#include <vector>

#include <expat.h>

#include "platform/plist/Readers.h"
#include "platform/plist/TextForms.h"

namespace platform::plist {

namespace {

enum class Element {
    plist,
    dict,
    array,
    key,
    string,
    integer,
    real,
    date,
    data,
    trueValue,
    falseValue
};

std::optional<Element> elementNamed(std::string_view name) {
    static constexpr std::pair<std::string_view, Element> names[] = {
        {"plist", Element::plist},    {"dict", Element::dict},       {"array", Element::array},
        {"key", Element::key},        {"string", Element::string},   {"integer", Element::integer},
        {"real", Element::real},      {"date", Element::date},       {"data", Element::data},
        {"true", Element::trueValue}, {"false", Element::falseValue}};
    for (const auto& [known, element] : names) {
        if (name == known)
            return element;
    }
    return std::nullopt;
}

bool isBlank(std::string_view text) {
    for (const char c : text) {
        if (!isXmlSpace(c))
            return false;
    }
    return true;
}

// Turns the parser's events into one value. The first thing that a property list does not allow
// stops the parser, with the reason in `failure`. Lives for one call.
class Reader {
public:
    Reader(XML_Parser parser, std::size_t deepest) : parser_(parser), deepest_(deepest) {
        XML_SetUserData(parser, this);
        XML_SetElementHandler(
            parser,
            [](void* self, const char* name, const char** attributes) {
                static_cast<Reader*>(self)->start(name, attributes[0] != nullptr);
            },
            [](void* self, const char*) { static_cast<Reader*>(self)->end(); });
        XML_SetCharacterDataHandler(parser, [](void* self, const char* text, int length) {
            static_cast<Reader*>(self)->text({text, static_cast<std::size_t>(length)});
        });
        refuseDeclarations();
    }

    std::string failure;

    // The finished value; nothing when the document held none.
    std::optional<Value> root;

private:
    // An open <dict> or <array>.
    struct Container {
        bool isDictionary;
        std::vector<Value> items;
        std::vector<DictionaryEntry> entries;
        std::optional<SharedBytes> key; // read, and waiting for its value
    };

    void refuseDeclarations();
    void start(const char* name, bool hasAttributes);
    void startContainer(bool isDictionary);
    void end();
    void endContainer();
    void endLeaf(Element leaf);
    void text(std::string_view piece);
    void place(Value value);
    [[nodiscard]] bool takesValue() const;

    void fail(const char* reason) {
        if (!failure.empty())
            return;
        failure = reason;
        XML_StopParser(parser_, XML_FALSE);
    }

    // A stopped parser may still have an event or two to tell.
    [[nodiscard]] bool stopped() const { return !failure.empty(); }

    XML_Parser parser_;
    std::size_t deepest_;
    bool inPlist_ = false;
    std::vector<Container> open_;
    std::optional<Element> leaf_;
    std::string text_;
};

void Reader::refuseDeclarations() {
    XML_SetStartDoctypeDeclHandler(
        parser_, [](void* self, const char*, const char*, const char*, int hasInternalSubset) {
            if (hasInternalSubset)
                static_cast<Reader*>(self)->fail("declarations in the document type");
        });
    XML_SetEntityDeclHandler(parser_, [](void* self, const char*, int, const char*, int,
                                         const char*, const char*, const char*, const char*) {
        static_cast<Reader*>(self)->fail("an entity declaration");
    });
    XML_SetSkippedEntityHandler(parser_, [](void* self, const char*, int) {
        static_cast<Reader*>(self)->fail("an unknown entity");
    });
}

// A value may stand once in the plist, anywhere in an array, and after each key of a dictionary.
bool Reader::takesValue() const {
    if (open_.empty())
        return inPlist_ && !root;
    return !open_.back().isDictionary || open_.back().key.has_value();
}

void Reader::start(const char* name, bool hasAttributes) {
    if (stopped())
        return;
    const auto element = elementNamed(name);
    if (!element)
        return fail("an unknown element");
    if (leaf_)
        return fail("an element inside a simple value");
    if (*element == Element::plist) {
        if (inPlist_)
            return fail("a plist inside a plist");
        inPlist_ = true;
        return;
    }
    if (hasAttributes)
        return fail("an attribute");
    if (*element == Element::key) {
        if (open_.empty() || !open_.back().isDictionary || open_.back().key)
            return fail("a key where a value belongs");
    } else if (!takesValue()) {
        return fail("a value where none belongs");
    }
    if (*element == Element::dict || *element == Element::array)
        return startContainer(*element == Element::dict);
    leaf_ = element;
    text_.clear();
}

void Reader::startContainer(bool isDictionary) {
    if (open_.size() >= deepest_)
        return fail("nested too deeply");
    open_.push_back({isDictionary, {}, {}, {}});
}

void Reader::end() {
    if (stopped())
        return;
    if (leaf_)
        return endLeaf(*std::exchange(leaf_, std::nullopt));
    if (!open_.empty())
        endContainer();
    // Else it is the end of the plist; whether it held a value is seen after the document's end.
}

void Reader::endContainer() {
    if (open_.back().key)
        return fail("a key without value");
    Container closed = std::move(open_.back());
    open_.pop_back();
    if (closed.isDictionary) {
        place(Value(Dictionary(std::move(closed.entries))));
    } else {
        place(Value(Array(std::move(closed.items))));
    }
}

void Reader::endLeaf(Element leaf) {
    std::optional<Value> value;
    switch (leaf) {
    case Element::key:
        open_.back().key = SharedBytes(text_);
        return;
    case Element::string:
        value = Value(text_);
        break;
    case Element::integer:
        value = readInteger(text_);
        break;
    case Element::real:
        value = readReal(text_);
        break;
    case Element::date:
        value = readDate(text_);
        break;
    case Element::data:
        value = readData(text_);
        break;
    case Element::trueValue:
    case Element::falseValue:
        if (isBlank(text_))
            value = Value(leaf == Element::trueValue);
        break;
    default:
        break;
    }
    if (!value)
        return fail("a malformed value");
    place(std::move(*value));
}

void Reader::place(Value value) {
    if (open_.empty()) {
        root = std::move(value);
    } else if (open_.back().isDictionary) {
        Container& dictionary = open_.back();
        dictionary.entries.push_back({std::move(*dictionary.key), std::move(value)});
        dictionary.key.reset();
    } else {
        open_.back().items.push_back(std::move(value));
    }
}

void Reader::text(std::string_view piece) {
    if (leaf_) {
        text_ += piece;
    } else if (!isBlank(piece)) {
        fail("text between values");
    }
}

} // namespace

std::expected<Value, Error> readXml(std::string_view bytes, std::size_t deepest) {
    const std::unique_ptr<XML_ParserStruct, decltype(&XML_ParserFree)> parser(
        XML_ParserCreate(nullptr), &XML_ParserFree);
    if (!parser || bytes.size() > INT_MAX)
        return std::unexpected(corrupt("property list: too large"));
    Reader reader(parser.get(), deepest);
    const auto status =
        XML_Parse(parser.get(), bytes.data(), static_cast<int>(bytes.size()), XML_TRUE);
    if (status == XML_STATUS_OK && reader.root)
        return std::move(*reader.root);

    std::string reason = std::move(reader.failure);
    if (reason.empty() && status == XML_STATUS_OK)
        reason = "no value";
    if (reason.empty())
        reason = XML_ErrorString(XML_GetErrorCode(parser.get()));
    const auto line = std::to_string(XML_GetCurrentLineNumber(parser.get()));
    return std::unexpected(corrupt("property list: line " + line + ": " + reason));
}

} // namespace platform::plist
