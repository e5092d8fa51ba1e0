#pragma once

#include <cstdint>
#include <optional>
#include <string>

// What the command line said. A plain value, made once by main().
struct ZPDOptions {
    static constexpr std::uint32_t defaultCacheLimit = 1'000'000;
    static constexpr const char* defaultServiceName = "com.tovana.zephrin.zpd";
    static constexpr const char* usage = "Usage: zpd [-S servicename] [-v]\n";

    std::uint32_t cacheLimit = defaultCacheLimit;
    std::optional<std::string> databasePath; // nothing: the annotation store's own default
    std::string serviceName = defaultServiceName;
    unsigned verbose = 0;

    // Nothing for an unknown option, an option without its argument, and leftover arguments: then
    // `usage` is to be shown. Not thread-safe (getopt).
    [[nodiscard]] static std::optional<ZPDOptions> parse(int argc, char* const argv[]);
};
