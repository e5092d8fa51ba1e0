#include "platform/sandbox/HmacSandbox.h"

#include <cerrno>
#include <cstdlib>
#include <unistd.h>

#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/rand.h>

#include "platform/file/File.h"
#include "platform/sandbox/Confinement.h"
#include "platform/value/Hex.h"

namespace platform {

namespace {

// The longest path, every byte of it encoded, and room for the rest.
constexpr std::size_t longestToken = 16UL << 10;

bool hasNul(std::string_view text) {
    return text.find('\0') != std::string_view::npos;
}

} // namespace

HmacSandbox::HmacSandbox() : secret_{} {
    // Without a secret nobody could know there would be no capabilities, only names.
    if (RAND_priv_bytes(secret_.data(), static_cast<int>(secret_.size())) != 1)
        std::abort();
}

HmacSandbox::~HmacSandbox() {
    OPENSSL_cleanse(secret_.data(), secret_.size());
}

bool HmacSandbox::isSandboxed(const ipc::Peer& peer) {
    if (!peer.executable)
        return true;
    const auto process = Confinement::of(peer.pid);
    const auto self = Confinement::of(::getpid());
    if (!process || !self || !ipc::isAlive(peer))
        return true;
    return isMoreConfined(*process, *self, Confinement::of(1));
}

std::string HmacSandbox::macOf(std::string_view text) const {
    std::array<unsigned char, EVP_MAX_MD_SIZE> mac{};
    unsigned size = 0;
    if (!HMAC(EVP_sha256(), secret_.data(), static_cast<int>(secret_.size()),
              reinterpret_cast<const unsigned char*>(text.data()), text.size(), mac.data(), &size))
        return {};
    std::string hex;
    for (unsigned i = 0; i < size; ++i)
        appendHex(hex, mac[i]);
    return hex;
}

std::expected<std::string, int> HmacSandbox::issue(const SandboxGrant& grant) const {
    std::string token = grant.text();
    const std::string mac = macOf(token);
    if (mac.empty())
        return std::unexpected(ENOMEM);
    token.append(";").append(mac);
    return token;
}

std::optional<SandboxGrant> HmacSandbox::verify(std::string_view token) const {
    const auto end = token.rfind(';');
    if (end == std::string_view::npos || token.size() > longestToken)
        return std::nullopt;
    const std::string_view text = token.substr(0, end);
    const std::string_view given = token.substr(end + 1);
    const std::string mac = macOf(text);
    if (mac.empty() || given.size() != mac.size())
        return std::nullopt;
    if (CRYPTO_memcmp(given.data(), mac.data(), mac.size()) != 0)
        return std::nullopt;
    return SandboxGrant::parse(text);
}

std::expected<std::string, int> HmacSandbox::issueFileExtension(std::string_view extensionClass,
                                                                std::string_view path,
                                                                std::uint32_t flags) {
    if (path.empty() || hasNul(path))
        return std::unexpected(ENOENT);
    if ((flags & canonicalPathFlag) == 0)
        return issue(
            {std::string(extensionClass), flags, SandboxGrant::Kind::file, std::string(path)});
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(canonical.error());
    return issue({std::string(extensionClass), flags, SandboxGrant::Kind::file, *canonical});
}

std::expected<std::string, int> HmacSandbox::issueServiceExtension(std::string_view extensionClass,
                                                                   std::string_view serviceName,
                                                                   std::uint32_t flags) {
    if (serviceName.empty() || hasNul(serviceName))
        return std::unexpected(EINVAL);
    return issue({std::string(extensionClass), flags, SandboxGrant::Kind::service,
                  std::string(serviceName)});
}

} // namespace platform
