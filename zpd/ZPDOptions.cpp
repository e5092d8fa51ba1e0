#include "zpd/ZPDOptions.h"

#include <limits>
#include <string_view>
#include <unistd.h>

#include "platform/log/Log.h"

namespace {

constexpr const char* ineffectiveVerbose =
    "verbose option -v is ineffective; use log config --subsystem com.tovana.zephrin";

// The leading decimal digits as a number, 0 without any, the greatest one when they do not fit.
std::uint32_t leadingNumber(std::string_view text) {
    constexpr std::uint64_t greatest = std::numeric_limits<std::uint32_t>::max();
    std::uint64_t number = 0;
    for (const char c : text) {
        if (c < '0' || c > '9')
            break;
        number = number * 10 + static_cast<std::uint64_t>(c - '0');
        if (number > greatest)
            return static_cast<std::uint32_t>(greatest);
    }
    return static_cast<std::uint32_t>(number);
}

// False for an option that is not known.
bool apply(ZPDOptions& options, int option, const char* argument) {
    switch (option) {
    case 'c':
        options.cacheLimit = leadingNumber(argument);
        return true;
    case 'd':
        options.databasePath = argument;
        return true;
    case 'S':
        options.serviceName = argument;
        return true;
    case 'v':
        ++options.verbose;
        platform::log::defaultLog().error(ineffectiveVerbose);
        return true;
    default:
        return false;
    }
}

} // namespace

std::optional<ZPDOptions> ZPDOptions::parse(int argc, char* const argv[]) {
    ZPDOptions options;
    ::opterr = 0; // the usage text says it all
    ::optind = 0; // glibc: start afresh
    for (int option = 0; (option = ::getopt(argc, argv, "c:d:S:v")) != -1;) {
        if (!apply(options, option, ::optarg))
            return std::nullopt;
    }
    if (::optind < argc)
        return std::nullopt;
    return options;
}
