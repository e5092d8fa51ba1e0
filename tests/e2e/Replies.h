#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tests/e2e/WireClient.h"

namespace e2e {

// What a reply says, for one-line expectations: "code text" of an error, or "" of a success.
[[nodiscard]] std::string errorOf(const Item& reply);

// The forms of a "match" reply; the form of a "find" reply.
[[nodiscard]] std::vector<Item> formsOf(const Item& reply);
[[nodiscard]] Item formOf(const Item& reply);

[[nodiscard]] std::vector<Item> match(WireClient& client, const Item& rules = Item::map({}),
                                      std::uint64_t flags = 0);
// The identifiers of the matches, sorted, with a space between.
[[nodiscard]] std::string matched(WireClient& client, const Item& rules = Item::map({}),
                                  std::uint64_t flags = 0);
// "identifier version" of the matches, sorted, with a comma between.
[[nodiscard]] std::string versions(WireClient& client, const Item& rules, std::uint64_t flags = 0);

// The form of the bundle at a path, by a "find" with its file URL.
[[nodiscard]] Item findAt(WireClient& client, const std::string& path);
[[nodiscard]] Item findRequest(const Item& more);
// "add", "remove"
[[nodiscard]] Item pathsRequest(const char* type, const std::vector<std::string>& paths);

} // namespace e2e
