#pragma once

#include <cstdint>
#include <map>
#include <string>

// Remembers which bundles were reported as unusable and why, so that each is reported once and
// not with every pass. Owned by the registry, used on its queue.
class ARComplaints {
public:
    // Writes a line unless this very trouble of this path was the last one reported.
    void report(const std::string& path, const std::string& reason, std::uint64_t pass);
    // The path is fine.
    void forget(const std::string& path);
    // A pass has looked at an item, or at everything: what it did not report is fine, or gone.
    void endItem(const std::string& item, std::uint64_t pass);
    void endPass(std::uint64_t pass);

private:
    struct Complaint {
        std::string reason;
        std::uint64_t pass = 0; // that had it last
    };

    std::map<std::string, Complaint> reported_; // by path
};
