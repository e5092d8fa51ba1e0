#pragma once

#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "AppRegistry/ARBundleRow.h"
#include "AppRegistry/ARSql.h"

// How entries stand in the database's columns, for the sources of ARStore alone.

// The bytes of something that is stored as it stands in memory: the database never leaves its box.
template <class T>
    requires std::has_unique_object_representations_v<T>
[[nodiscard]] std::string_view ARBytesOf(const T& thing) {
    return {reinterpret_cast<const char*>(&thing), sizeof thing};
}

[[nodiscard]] std::string AREncodePoints(std::span<const platform::SharedBytes> points);
// Nothing when the bytes are not what AREncodePoints makes.
[[nodiscard]] std::optional<std::vector<platform::SharedBytes>>
ARDecodePoints(std::string_view bytes);

// The columns that ARReadRow reads.
inline constexpr const char* ARSelectRows =
    "SELECT id, kind, presence, placeholder, types, uuid, path, identifier, original, bundle,"
    " version, executable, registered, stamps, points FROM entries ORDER BY id";

// The row that the statement stands at; nothing when it holds what was never written.
[[nodiscard]] std::optional<ARBundleRow> ARReadRow(const ARSqlStatement& statement);
