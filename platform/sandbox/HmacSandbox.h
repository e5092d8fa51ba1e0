#pragma once

#include <array>
#include <string>

#include "platform/sandbox/Sandbox.h"

namespace platform {

// The sandbox service of a plain kernel. A token is the text
//
//   zsx1;class;flags;kind;target;mac
//
// with flags in hexadecimal, kind "file" or "service", class and target percent-encoded (all but
// letters, digits and "-._~/"), and mac the HMAC-SHA-256, in hexadecimal, of everything before the
// last ";" under a secret made with the object. Owned by the platform; any thread.
class HmacSandbox final : public Sandbox {
public:
    HmacSandbox();
    ~HmacSandbox() override;

    [[nodiscard]] bool isSandboxed(const ipc::Peer& peer) override;
    [[nodiscard]] std::expected<std::string, int>
    issueFileExtension(std::string_view extensionClass, std::string_view path,
                       std::uint32_t flags) override;
    [[nodiscard]] std::expected<std::string, int>
    issueServiceExtension(std::string_view extensionClass, std::string_view serviceName,
                          std::uint32_t flags) override;

private:
    [[nodiscard]] std::expected<std::string, int> issue(std::string_view extensionClass,
                                                        std::uint32_t flags, std::string_view kind,
                                                        std::string_view target) const;
    [[nodiscard]] std::string macOf(std::string_view text) const;

    std::array<unsigned char, 32> secret_;
};

} // namespace platform
