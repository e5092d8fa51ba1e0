#include "AppRegistry/ARKeptFacts.h"

#include <cerrno>
#include <cstdint>
#include <limits>

#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARModel.h"
#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"
#include "platform/plist/PropertyList.h"

using platform::Array;
using platform::Data;
using platform::Dictionary;
using platform::DictionaryEntry;
using platform::Error;
using platform::SharedBytes;
using platform::Value;

namespace {

constexpr std::uint64_t formatVersion = 1;
constexpr const char* versionKey = "version";
constexpr const char* addedKey = "added";
constexpr const char* withdrawnKey = "removed";
constexpr const char* usersKey = "users";
constexpr std::size_t largestFile = std::size_t{64} << 20;
constexpr unsigned fileMode = 0644;

// As text where a property list can hold it; any other bytes can be a path too.
Value valueOf(const std::string& bytes) {
    const Value text(bytes);
    return platform::plist::objectionToXml(text) ? Value(Data{SharedBytes(bytes)}) : text;
}

std::string_view bytesOf(const Value& value) {
    return value.data() ? value.data()->bytes.view() : value.string().value_or("");
}

Value valueOf(const std::vector<std::string>& paths) {
    std::vector<Value> values;
    for (const std::string& path : paths)
        values.push_back(valueOf(path));
    return Array(std::move(values));
}

// One that cannot be a key of a property list is left to the database and its container's owner.
Value valueOf(const std::vector<ARPlugInUser>& users) {
    std::vector<DictionaryEntry> entries;
    entries.reserve(users.size());
    for (const auto& [identifier, user] : users) {
        if (!platform::plist::objectionToXml(Value(identifier)))
            entries.push_back({SharedBytes(identifier), user});
    }
    return Dictionary(std::move(entries));
}

// Files of old have none.
std::optional<std::vector<ARPlugInUser>> usersIn(const Dictionary& content) {
    std::vector<ARPlugInUser> users;
    const Dictionary* const entries = content.findDictionary(usersKey);
    for (const auto& [identifier, value] : entries ? *entries : Dictionary()) {
        const auto user = value.unsignedInteger();
        if (identifier.view().empty() || !user || *user > std::numeric_limits<uid_t>::max())
            return std::nullopt;
        users.emplace_back(identifier.view(), static_cast<uid_t>(*user));
    }
    return users;
}

std::optional<std::vector<std::string>> pathsIn(const Dictionary& content, const char* key) {
    const Array* const values = content.findArray(key);
    if (!values)
        return std::nullopt;
    std::vector<std::string> paths;
    for (const Value& each : *values) {
        const auto text = bytesOf(each);
        if (!text.starts_with('/'))
            return std::nullopt;
        paths.emplace_back(text);
    }
    return paths;
}

// On failure the reason.
std::expected<ARKeptFacts::Facts, std::string> parse(std::string_view bytes) {
    const auto root = platform::plist::parse(bytes);
    if (!root)
        return std::unexpected(describe(root.error()));
    const Dictionary content = root->dictionary() ? *root->dictionary() : Dictionary();
    const Value* const version = content.find(versionKey);
    if (!version || version->unsignedInteger() != formatVersion)
        return std::unexpected("its version is not known");
    auto added = pathsIn(content, addedKey);
    auto withdrawn = pathsIn(content, withdrawnKey);
    auto users = usersIn(content);
    if (!added || !withdrawn || !users)
        return std::unexpected("its lists are not lists of paths and of users");
    return ARKeptFacts::Facts{std::move(*added), std::move(*withdrawn), std::move(*users)};
}

// Nothing when there is none; on failure the reason.
std::expected<std::optional<std::string>, std::string> readTrusted(const std::string& file) {
    platform::OwnershipTest ownership;
    const auto canonical = platform::canonicalPath(file);
    if (!canonical && canonical.error() == ENOENT)
        return std::nullopt;
    if (!canonical)
        return std::unexpected(describe(platform::posixError(canonical.error(), file)));
    if (auto refusal = ownership.refusal(*canonical))
        return std::unexpected(std::move(*refusal));
    auto content = platform::readRegularFile(*canonical, largestFile);
    if (!content)
        return std::unexpected(describe(content.error()));
    return std::move(content->bytes);
}

ARKeptFacts::Facts factsOf(const ARModel& model, const ARPlugInUsers& users) {
    ARKeptFacts::Facts facts;
    facts.users = users.all();
    const auto rows =
        model.pick([](const ARModel::Entry& entry) { return ARIsRegisteredByPath(*entry.row); });
    for (const ARRowPtr& row : rows) {
        const bool isAdded = row->presence == ARPresence::added;
        (isAdded ? facts.added : facts.withdrawn).emplace_back(row->path.view());
    }
    return facts;
}

} // namespace

void ARKeptFacts::removeUnfinished() const {
    platform::removeUnfinishedFiles(file_);
}

ARKeptFacts::Facts ARKeptFacts::read() const {
    const auto bytes = readTrusted(file_);
    if (bytes && !*bytes)
        return {};
    auto facts = bytes ? parse(**bytes) : std::unexpected(bytes.error());
    if (facts)
        return std::move(*facts);
    ARLog().error("ignoring %{public}@: %{public}@", file_, facts.error());
    return {};
}

void ARKeptFacts::keep(const ARModel& model, const ARPlugInUsers& users) const {
    if (const auto error = bring(factsOf(model, users)))
        ARLog().error("what was registered by path cannot be kept: %{public}@", *error);
}

// By their text: no second copy of the facts is kept, nor read into values.
std::optional<Error> ARKeptFacts::bring(const Facts& facts) const {
    const auto xml = platform::plist::writeXml(Dictionary{{versionKey, formatVersion},
                                                          {addedKey, valueOf(facts.added)},
                                                          {withdrawnKey, valueOf(facts.withdrawn)},
                                                          {usersKey, valueOf(facts.users)}});
    if (!xml)
        return xml.error();
    const auto held = readTrusted(file_);
    const bool hasNothing = held && !*held && facts == Facts();
    if (hasNothing || (held && *held == *xml))
        return std::nullopt;
    return platform::writeFileAtomically(file_, *xml, fileMode);
}
