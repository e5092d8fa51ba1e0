#pragma once

#include <expected>
#include <optional>
#include <string>
#include <vector>

#include "platform/value/Error.h"

class ARModel;

// What the folders do not tell: which plug-ins were registered by their paths, and which ones were
// taken away by them. It stands in the database; this keeps it in a file beside that as well
// (docs/registry.md), for the case that the database is lost. Owned by the registry, used on its
// queue.
class ARKeptPaths {
public:
    struct Paths {
        std::vector<std::string> added;     // in order of registration
        std::vector<std::string> withdrawn; // likewise

        friend bool operator==(const Paths&, const Paths&) = default;
    };

    static constexpr const char* fileSuffix = ".plist"; // beside the database

    explicit ARKeptPaths(std::string file) : file_(std::move(file)) {}

    // What the file holds. One that is missing, damaged or could have been written by others holds
    // nothing; the latter two are told in the log.
    [[nodiscard]] Paths read();
    // Brings the file to what the model holds, and to the disk, unless it holds that already. What
    // cannot be written is told in the log, and written the next time.
    void keep(const ARModel& model);

private:
    [[nodiscard]] std::optional<platform::Error> write(const Paths& paths) const;

    const std::string file_;
    std::optional<Paths> held_; // by the file; nothing when that is not known
};
