#pragma once

#include <string>

#include "platform/container/Containers.h"

namespace platform {

// Data containers as folders of one folder, named by their identifiers. An existing container is
// taken as it is. Owned by the platform; any thread.
class FolderContainers final : public Containers {
public:
    explicit FolderContainers(std::string folder) : folder_(std::move(folder)) {}

    [[nodiscard]] std::expected<std::string, Error>
    dataContainer(std::string_view identifier, std::optional<uid_t> owner) override;
    [[nodiscard]] std::vector<std::pair<std::string, uid_t>> owners() override;

private:
    const std::string folder_;
};

} // namespace platform
