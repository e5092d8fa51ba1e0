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
using platform::Error;
using platform::SharedBytes;
using platform::Value;

namespace {

constexpr std::uint64_t formatVersion = 1;
constexpr const char* versionKey = "version";
constexpr const char* addedKey = "added";
constexpr const char* withdrawnKey = "removed";
constexpr const char* usersKey = "users";
constexpr const char* identifierKey = "identifier";
constexpr const char* userKey = "user";
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

Value valueOf(const std::vector<ARPlugInUser>& users) {
    std::vector<Value> values;
    for (const auto& [identifier, user] : users)
        values.emplace_back(Dictionary{{identifierKey, valueOf(identifier)}, {userKey, user}});
    return Array(std::move(values));
}

// Nothing for one that makes no sense.
std::optional<ARPlugInUser> userIn(const Value& value) {
    const Dictionary entry = value.dictionary() ? *value.dictionary() : Dictionary();
    const Value* const identifier = entry.find(identifierKey);
    const Value* const user = entry.find(userKey);
    const auto number = user ? user->unsignedInteger() : std::nullopt;
    if (!identifier || bytesOf(*identifier).empty() || !number ||
        *number > std::numeric_limits<uid_t>::max())
        return std::nullopt;
    return ARPlugInUser(bytesOf(*identifier), static_cast<uid_t>(*number));
}

// Files of old have none.
std::optional<std::vector<ARPlugInUser>> usersIn(const Dictionary& content) {
    std::vector<ARPlugInUser> users;
    const Array* const values = content.findArray(usersKey);
    for (const Value& each : values ? *values : Array()) {
        auto user = userIn(each);
        if (!user)
            return std::nullopt;
        users.push_back(std::move(*user));
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

std::expected<ARKeptFacts::Facts, std::string> readTrusted(const std::string& file) {
    platform::OwnershipTest ownership;
    const auto canonical = platform::canonicalPath(file);
    if (!canonical && canonical.error() == ENOENT)
        return ARKeptFacts::Facts();
    if (!canonical)
        return std::unexpected(describe(platform::posixError(canonical.error(), file)));
    if (auto refusal = ownership.refusal(*canonical))
        return std::unexpected(std::move(*refusal));
    const auto content = platform::readRegularFile(*canonical, largestFile);
    if (!content)
        return std::unexpected(describe(content.error()));
    return parse(content->bytes);
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

ARKeptFacts::Facts ARKeptFacts::read() {
    platform::removeUnfinishedFiles(file_);
    auto facts = readTrusted(file_);
    if (facts) {
        held_ = *facts;
        return std::move(*facts);
    }
    ARLog().error("ignoring %{public}@: %{public}@", file_, facts.error());
    return {};
}

void ARKeptFacts::keep(const ARModel& model, const ARPlugInUsers& users) {
    Facts facts = factsOf(model, users);
    if (held_ == facts)
        return;
    held_.reset();
    if (const auto error = write(facts))
        return ARLog().error("what was registered by path cannot be kept: %{public}@", *error);
    held_ = std::move(facts);
}

std::optional<Error> ARKeptFacts::write(const Facts& facts) const {
    const auto xml = platform::plist::writeXml(Dictionary{{versionKey, formatVersion},
                                                          {addedKey, valueOf(facts.added)},
                                                          {withdrawnKey, valueOf(facts.withdrawn)},
                                                          {usersKey, valueOf(facts.users)}});
    if (!xml)
        return xml.error();
    return platform::writeFileAtomically(file_, *xml, fileMode);
}
