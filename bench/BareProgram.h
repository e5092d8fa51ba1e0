#pragma once

#include <string>

namespace bench {

// The least that a program must do to know the same as the daemon, run as a program of its own.
// `list` names a file with one path in each line. Both answer an exit status.

// Stats every path and loads every row of the daemon's registry database.
int bareWarmStart(const std::string& list, const std::string& database);
// Reads and hashes every regular file, parses every Info.plist, and inserts one row for each.
int bareFirstStart(const std::string& list, const std::string& database);

} // namespace bench
