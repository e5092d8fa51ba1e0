#pragma once

#include <string>

#include "tests/e2e/Item.h"

namespace e2e {

// Writes property lists for the bundles that the tests make. Items of the kinds that a property
// list has; a date is tag 1 of a double.
[[nodiscard]] std::string xmlPlist(const Item& root);

} // namespace e2e
