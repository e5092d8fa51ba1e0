#include "AppRegistry/ARStoreRow.h"

#include <cstring>

using platform::SharedBytes;

namespace {

enum Column : int {
    idColumn,
    kindColumn,
    presenceColumn,
    placeholderColumn,
    typesColumn,
    uuidColumn,
    pathColumn,
    identifierColumn,
    originalColumn,
    bundleColumn,
    versionColumn,
    executableColumn,
    registeredColumn,
    stampsColumn,
    pointsColumn
};

std::optional<SharedBytes> optionalText(const ARSqlStatement& statement, int column) {
    if (statement.isNull(column))
        return std::nullopt;
    return SharedBytes(statement.bytes(column));
}

template <class T>
bool readInto(T& thing, std::string_view bytes) {
    if (bytes.size() != sizeof thing)
        return false;
    std::memcpy(&thing, bytes.data(), sizeof thing);
    return true;
}

// Shares the text with `other` when it is the same.
SharedBytes shared(std::string_view text, const SharedBytes& other) {
    return text == other.view() ? other : SharedBytes(text);
}

bool readNumbers(ARBundleRow& row, const ARSqlStatement& statement) {
    const std::int64_t kind = statement.integer(kindColumn);
    const std::int64_t presence = statement.integer(presenceColumn);
    if (kind < 0 || kind > 2 || presence < 0 || presence > 2)
        return false;
    row.id = statement.integer(idColumn);
    row.kind = static_cast<ARKind>(kind);
    row.presence = static_cast<ARPresence>(presence);
    row.placeholder = statement.integer(placeholderColumn) != 0;
    row.declaresTypes = statement.integer(typesColumn) != 0;
    row.registered.secondsSinceEpoch = statement.real(registeredColumn);
    return true;
}

void readTexts(ARBundleRow& row, const ARSqlStatement& statement) {
    row.path = SharedBytes(statement.bytes(pathColumn));
    row.identifier = SharedBytes(statement.bytes(identifierColumn));
    row.originalIdentifier = shared(statement.bytes(originalColumn), row.identifier);
    row.bundleIdentifier = optionalText(statement, bundleColumn);
    if (row.bundleIdentifier == row.identifier)
        row.bundleIdentifier = row.identifier;
    row.bundleVersion = optionalText(statement, versionColumn);
    row.executable = SharedBytes(statement.bytes(executableColumn));
}

} // namespace

std::string AREncodePoints(std::span<const SharedBytes> points) {
    std::string bytes;
    for (const SharedBytes& point : points) {
        const auto size = static_cast<std::uint32_t>(point.size());
        bytes += ARBytesOf(size);
        bytes += point.view();
    }
    return bytes;
}

std::optional<std::vector<SharedBytes>> ARDecodePoints(std::string_view bytes) {
    std::vector<SharedBytes> points;
    while (!bytes.empty()) {
        std::uint32_t size = 0;
        if (!readInto(size, bytes.substr(0, sizeof size)))
            return std::nullopt;
        bytes.remove_prefix(sizeof size);
        if (size > bytes.size())
            return std::nullopt;
        points.emplace_back(bytes.substr(0, size));
        bytes.remove_prefix(size);
    }
    return points;
}

std::optional<ARBundleRow> ARReadRow(const ARSqlStatement& statement) {
    ARBundleRow row;
    if (!readNumbers(row, statement))
        return std::nullopt;
    if (!readInto(row.uuid.bytes, statement.bytes(uuidColumn)) ||
        !readInto(row.stamps, statement.bytes(stampsColumn)))
        return std::nullopt;
    readTexts(row, statement);
    const bool named = row.identifier.size() != 0 || row.kind == ARKind::application;
    if (!row.path.view().starts_with('/') || !named)
        return std::nullopt;
    auto points = ARDecodePoints(statement.bytes(pointsColumn));
    if (!points)
        return std::nullopt;
    row.points = std::move(*points);
    return row;
}
