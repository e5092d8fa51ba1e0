#pragma once

#include <array>
#include <optional>
#include <string>

#include "platform/sandbox/Sandbox.h"
#include "platform/sandbox/SandboxGrant.h"

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

    // What a token permits. Nothing for a text that this very object did not issue, whole and
    // unchanged; how long that takes does not tell how much of it was right.
    [[nodiscard]] std::optional<SandboxGrant> verify(std::string_view token) const;

private:
    [[nodiscard]] std::expected<std::string, int> issue(const SandboxGrant& grant) const;
    [[nodiscard]] std::string macOf(std::string_view text) const;

    std::array<unsigned char, 32> secret_;
};

} // namespace platform
