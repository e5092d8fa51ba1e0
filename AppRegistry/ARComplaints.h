#pragma once

#include <string>
#include <unordered_map>

// Remembers what was said about which bundle, so that each trouble is reported once and not
// whenever it is met. Owned by whoever reports; one thread at a time.
class ARComplaints {
public:
    // True unless this very trouble of this path was the last one reported.
    [[nodiscard]] bool isNew(const std::string& path, const std::string& reason);
    // The path is fine, or gone.
    void forget(const std::string& path);

private:
    std::unordered_map<std::string, std::string> reported_;
};
