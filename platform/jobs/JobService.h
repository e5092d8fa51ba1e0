#pragma once

#include <cstddef>
#include <expected>
#include <memory>
#include <string>

#include "platform/file/File.h"
#include "platform/jobs/Jobs.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

// What a host may start: an external service as it was checked when it was added. Never changes;
// shared by its host and its instances.
struct JobService {
    // Bytes of names and values together.
    static constexpr std::size_t largestEnvironment = 64UL << 10;

    // Opens the executable, which must be a regular file that may be executed, and reads the
    // overlay. What is no text in "EnvironmentVariables", or no variable, is left out. On failure
    // the errno value.
    [[nodiscard]] static std::expected<std::shared_ptr<const JobService>, int>
    create(const ExternalService& service, const Dictionary& overlay);

    // Opens the very file that was there when the service was added.
    [[nodiscard]] std::expected<UniqueFd, Error> open() const;

    ExternalService what;
    std::string profile;
    Dictionary environment; // text to text
    std::size_t environmentSize = 0;
    FileStamp stamp; // of the executable
};

} // namespace platform
