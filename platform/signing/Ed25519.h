#pragma once

#include <expected>
#include <memory>
#include <string>
#include <string_view>

namespace platform {

// Ed25519 keys (RFC 8032) as PEM files hold them. Copies share the key; any thread. On failure the
// reason, in words for people.
class PublicKey {
public:
    [[nodiscard]] static std::expected<PublicKey, std::string> fromPem(std::string_view pem);

    // SHA-256 of the key's SubjectPublicKeyInfo (RFC 8410), in hexadecimal.
    [[nodiscard]] const std::string& identifier() const { return identifier_; }

    [[nodiscard]] bool verifies(std::string_view message, std::string_view signature) const;
    [[nodiscard]] std::string pem() const;

private:
    friend class PrivateKey;
    struct Impl;
    explicit PublicKey(std::shared_ptr<const Impl> impl);

    std::shared_ptr<const Impl> impl_;
    std::string identifier_;
};

class PrivateKey {
public:
    [[nodiscard]] static std::expected<PrivateKey, std::string> generate();
    [[nodiscard]] static std::expected<PrivateKey, std::string> fromPem(std::string_view pem);

    [[nodiscard]] std::expected<PublicKey, std::string> publicKey() const;
    // 64 bytes.
    [[nodiscard]] std::expected<std::string, std::string> sign(std::string_view message) const;
    [[nodiscard]] std::string pem() const; // PKCS #8, not encrypted

private:
    explicit PrivateKey(std::shared_ptr<const PublicKey::Impl> impl);

    std::shared_ptr<const PublicKey::Impl> impl_;
};

} // namespace platform
