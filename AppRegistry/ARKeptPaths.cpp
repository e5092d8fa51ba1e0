#include "AppRegistry/ARKeptPaths.h"

#include <cerrno>
#include <cstdint>

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
constexpr std::size_t largestFile = std::size_t{64} << 20;
constexpr unsigned fileMode = 0644;

// As text where a property list can hold it; any other bytes can be a path too.
Value valueOf(const std::string& path) {
    const Value text(path);
    return platform::plist::objectionToXml(text) ? Value(Data{SharedBytes(path)}) : text;
}

Value valueOf(const std::vector<std::string>& paths) {
    std::vector<Value> values;
    for (const std::string& path : paths)
        values.push_back(valueOf(path));
    return Array(std::move(values));
}

std::optional<std::vector<std::string>> pathsIn(const Dictionary& content, const char* key) {
    const Array* const values = content.findArray(key);
    if (!values)
        return std::nullopt;
    std::vector<std::string> paths;
    for (const Value& each : *values) {
        const auto text = each.data() ? each.data()->bytes.view() : each.string().value_or("");
        if (!text.starts_with('/'))
            return std::nullopt;
        paths.emplace_back(text);
    }
    return paths;
}

// On failure the reason.
std::expected<ARKeptPaths::Paths, std::string> parse(std::string_view bytes) {
    const auto root = platform::plist::parse(bytes);
    if (!root)
        return std::unexpected(describe(root.error()));
    const Dictionary content = root->dictionary() ? *root->dictionary() : Dictionary();
    const Value* const version = content.find(versionKey);
    if (!version || version->unsignedInteger() != formatVersion)
        return std::unexpected("its version is not known");
    auto added = pathsIn(content, addedKey);
    auto withdrawn = pathsIn(content, withdrawnKey);
    if (!added || !withdrawn)
        return std::unexpected("its lists are not lists of paths");
    return ARKeptPaths::Paths{std::move(*added), std::move(*withdrawn)};
}

std::expected<ARKeptPaths::Paths, std::string> readTrusted(const std::string& file) {
    platform::OwnershipTest ownership;
    const auto canonical = platform::canonicalPath(file);
    if (!canonical && canonical.error() == ENOENT)
        return ARKeptPaths::Paths();
    if (!canonical)
        return std::unexpected(describe(platform::posixError(canonical.error(), file)));
    if (auto refusal = ownership.refusal(*canonical))
        return std::unexpected(std::move(*refusal));
    const auto content = platform::readRegularFile(*canonical, largestFile);
    if (!content)
        return std::unexpected(describe(content.error()));
    return parse(content->bytes);
}

ARKeptPaths::Paths pathsOf(const ARModel& model) {
    ARKeptPaths::Paths paths;
    const auto rows =
        model.pick([](const ARModel::Entry& entry) { return ARIsRegisteredByPath(*entry.row); });
    for (const ARRowPtr& row : rows) {
        const bool isAdded = row->presence == ARPresence::added;
        (isAdded ? paths.added : paths.withdrawn).emplace_back(row->path.view());
    }
    return paths;
}

} // namespace

ARKeptPaths::Paths ARKeptPaths::read() {
    platform::removeUnfinishedFiles(file_);
    auto paths = readTrusted(file_);
    if (paths) {
        held_ = *paths;
        return std::move(*paths);
    }
    ARLog().error("ignoring %{public}@: %{public}@", file_, paths.error());
    return {};
}

void ARKeptPaths::keep(const ARModel& model) {
    Paths paths = pathsOf(model);
    if (held_ == paths)
        return;
    held_.reset();
    if (const auto error = write(paths))
        return ARLog().error("what was registered by path cannot be kept: %{public}@", *error);
    held_ = std::move(paths);
}

std::optional<Error> ARKeptPaths::write(const Paths& paths) const {
    const auto xml =
        platform::plist::writeXml(Dictionary{{versionKey, formatVersion},
                                             {addedKey, valueOf(paths.added)},
                                             {withdrawnKey, valueOf(paths.withdrawn)}});
    if (!xml)
        return xml.error();
    return platform::writeFileAtomically(file_, *xml, fileMode);
}
