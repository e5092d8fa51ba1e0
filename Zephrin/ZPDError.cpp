#include "Zephrin/ZPDError.h"

const platform::ErrorDomain ZPDErrorDomain{"Zephrin"};

platform::Error ZPDErrorMake(std::int64_t code, std::optional<std::string_view> message) {
    platform::Error error{&ZPDErrorDomain, code, std::nullopt};
    if (message)
        error.description = std::string(*message);
    return error;
}
