#pragma once

#include <cstddef>
#include <mutex>
#include <set>
#include <string>

#include "platform/signing/Verification.h"

namespace platform {

// Tells why programs have no entitlements: once for each reason and file, where a file that changed
// is another one. Looks at no file. Owned by the signing service; any thread.
class RefusalLog {
public:
    // With one more, all are forgotten.
    static constexpr std::size_t mostRemembered = 1024;

    // Nothing is said of a verification that was passed.
    void report(const std::string& path, const Verification& result);

private:
    [[nodiscard]] bool isNew(std::string entry);

    std::mutex mutex_;
    std::set<std::string> reported_;
};

} // namespace platform
