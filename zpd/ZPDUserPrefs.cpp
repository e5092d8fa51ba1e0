#include "zpd/ZPDUserPrefs.h"

std::optional<platform::Value> ZPDUserPrefs::exclusions() {
    preferences_.synchronize(domain);
    return preferences_.value(domain, "exclusions");
}
