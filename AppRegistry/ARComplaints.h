#pragma once

#include <string>
#include <unordered_map>

// Remembers which bundles were reported as unusable and why, so that each is reported once and
// not with every pass. Owned by the registry, used on its queue.
class ARComplaints {
public:
    // Writes a line unless this very trouble of this path was the last one reported.
    void report(const std::string& path, const std::string& reason);
    // The path is fine, or gone.
    void forget(const std::string& path);

private:
    std::unordered_map<std::string, std::string> reported_;
};
