#pragma once

#include <expected>
#include <optional>
#include <string>
#include <vector>

namespace platform {

// The file in which consent is kept, for the tools that change it: a property list with one
// dictionary, of application identifiers to lists of records as Consent.h has them. A change
// replaces the whole file at once, and keeps what it does not know; tools that write at the same
// time take turns. One thread.
class ConsentFile {
public:
    // A larger file would not be read.
    static constexpr std::size_t largest = 1024 * 1024;

    struct Record {
        std::string application; // identifier
        std::string service;
        bool granted = false;

        friend bool operator==(const Record&, const Record&) = default;
    };

    explicit ConsentFile(std::string path) : path_(std::move(path)) {}

    // All of them, by application; none while there is no file. Otherwise why it does not count: it
    // is broken, or others could have written it.
    [[nodiscard]] std::expected<std::vector<Record>, std::string> records() const;

    // From here on this is what the user said. On failure the reason; nothing has changed then. A
    // file that does not count is left as it is.
    [[nodiscard]] std::optional<std::string> record(const Record& record) const;

private:
    [[nodiscard]] std::optional<std::string> recordLocked(const Record& record) const;

    const std::string path_;
};

} // namespace platform
