#include "platform/sandbox/HmacSandbox.h"

#include <cerrno>
#include <charconv>
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

constexpr std::string_view tokenVersion = "zsx1";

bool standsForItself(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
           std::string_view("-._~/").find(c) != std::string_view::npos;
}

void appendEncoded(std::string& out, std::string_view text) {
    for (const char c : text) {
        if (standsForItself(c)) {
            out += c;
        } else {
            out += '%';
            appendHex(out, static_cast<unsigned char>(c));
        }
    }
}

void appendFlags(std::string& out, std::uint32_t flags) {
    std::array<char, 8> room;
    out.append(room.data(), std::to_chars(room.data(), room.data() + room.size(), flags, 16).ptr);
}

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

std::expected<std::string, int> HmacSandbox::issue(std::string_view extensionClass,
                                                   std::uint32_t flags, std::string_view kind,
                                                   std::string_view target) const {
    std::string token(tokenVersion);
    token += ';';
    appendEncoded(token, extensionClass);
    token += ';';
    appendFlags(token, flags);
    token.append(";").append(kind).append(";");
    appendEncoded(token, target);
    const std::string mac = macOf(token);
    if (mac.empty())
        return std::unexpected(ENOMEM);
    return token + ";" + mac;
}

std::expected<std::string, int> HmacSandbox::issueFileExtension(std::string_view extensionClass,
                                                                std::string_view path,
                                                                std::uint32_t flags) {
    if (path.empty() || hasNul(path))
        return std::unexpected(ENOENT);
    if ((flags & canonicalPathFlag) == 0)
        return issue(extensionClass, flags, "file", path);
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(canonical.error());
    return issue(extensionClass, flags, "file", *canonical);
}

std::expected<std::string, int> HmacSandbox::issueServiceExtension(std::string_view extensionClass,
                                                                   std::string_view serviceName,
                                                                   std::uint32_t flags) {
    if (serviceName.empty() || hasNul(serviceName))
        return std::unexpected(EINVAL);
    return issue(extensionClass, flags, "service", serviceName);
}

} // namespace platform
