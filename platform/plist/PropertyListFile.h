#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "platform/file/File.h"
#include "platform/value/Value.h"

namespace platform {

// A dictionary kept in a property-list file that an administrator may change at any time: read
// when it changed, and empty while there is none. A file that others than root and the daemon's
// user could have written, or that is not a property list of a dictionary, counts as empty, with
// one error line for each state of the file. Owned by the service that it serves, which locks it.
class PropertyListFile {
public:
    explicit PropertyListFile(std::string path, std::size_t largest = 1024 * 1024)
        : path_(std::move(path)), largest_(largest) {}

    // Looks whether the file changed, and reads it if so. Tells whether the dictionary may differ.
    bool refresh();

    // What the last refresh found.
    [[nodiscard]] const Dictionary& dictionary() const { return dictionary_; }

private:
    void read();

    std::string path_;
    std::size_t largest_;
    std::optional<FileStamp> stamp_; // of what was read; empty for a missing file
    bool known_ = false;             // stamp_ is worth comparing with
    std::string complaint_;          // the last one written, so that it is written once
    Dictionary dictionary_;
};

} // namespace platform
