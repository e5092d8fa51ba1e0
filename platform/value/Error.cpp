#include "platform/value/Error.h"

#include <system_error>

namespace platform {

const ErrorDomain posixErrorDomain{"POSIX"};
const ErrorDomain fileErrorDomain{"File"};
const ErrorDomain formatErrorDomain{"Format"};

std::string describe(const Error& error) {
    std::string text = error.domain ? error.domain->name : "unknown";
    text += " error ";
    text += std::to_string(error.code);
    if (error.description) {
        text += ": ";
        text += *error.description;
    }
    return text;
}

Error posixError(int number, const std::string& what) {
    return {&posixErrorDomain, number, what + ": " + std::generic_category().message(number)};
}

} // namespace platform
