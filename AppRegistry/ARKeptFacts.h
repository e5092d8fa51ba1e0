#pragma once

#include <expected>
#include <optional>
#include <string>
#include <vector>

#include "AppRegistry/ARPlugInUsers.h"
#include "platform/value/Error.h"

class ARModel;

// What the folders do not tell: which plug-ins were registered by their paths, which ones were
// taken away by them, and the user ids of plug-ins. It stands in the database; this keeps it in a
// file beside that as well (docs/registry.md), for the case that the database is lost. Owned by the
// registry, used on its queue.
class ARKeptFacts {
public:
    struct Facts {
        std::vector<std::string> added;     // in order of registration
        std::vector<std::string> withdrawn; // likewise

        std::vector<ARPlugInUser> users; // in order of identifiers

        friend bool operator==(const Facts&, const Facts&) = default;
    };

    static constexpr const char* fileSuffix = ".plist"; // beside the database

    explicit ARKeptFacts(std::string file) : file_(std::move(file)) {}

    // What an interrupted write has left.
    void removeUnfinished() const;
    // What the file holds. One that is missing, damaged or could have been written by others holds
    // nothing; the latter two are told in the log.
    [[nodiscard]] Facts read() const;
    // Brings the file to what the model and the users hold, and to the disk, unless it holds that
    // already. What cannot be written is told in the log, and written the next time.
    void keep(const ARModel& model, const ARPlugInUsers& users) const;

private:
    [[nodiscard]] std::optional<platform::Error> bring(const Facts& facts) const;

    const std::string file_;
};
