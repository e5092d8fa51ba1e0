#include "Zephrin/ZPDLog.h"

#include <new>

using platform::log::Category;

const Category& ZPDLogCreate(const char* category) {
    const auto* const made = new (std::nothrow) Category(category);
    if (made)
        return *made;
    const Category& fallback = platform::log::defaultLog();
    fallback.error("unable to create ulog for category %s", category);
    return fallback;
}

const Category& ZPDLogOps() {
    static const Category& handle = ZPDLogCreate("ops");
    return handle;
}

const Category& ZPDLogTraffic() {
    static const Category& handle = ZPDLogCreate("traffic");
    return handle;
}

const Category& ZPDLogExtension() {
    static const Category& handle = ZPDLogCreate("extension");
    return handle;
}

const Category& ZPDLogAr() {
    static const Category& handle = ZPDLogCreate("ar");
    return handle;
}

const Category& ZPDLogSandbox() {
    static const Category& handle = ZPDLogCreate("sandbox");
    return handle;
}
