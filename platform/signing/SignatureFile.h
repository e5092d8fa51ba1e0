#pragma once

#include <cstdint>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "platform/digest/Sha256.h"
#include "platform/value/Value.h"

namespace platform {

// What a signer says of a program or bundle. A plain value.
struct SignedStatement {
    struct Executable {
        std::uint64_t size = 0;
        Sha256Digest digest{};
    };

    std::string identifier;               // the bundle's identifier, or the lone executable's name
    std::optional<Executable> executable; // none for a bundle without one
    std::optional<Sha256Digest> info;     // Info.plist; none for a lone executable
    Dictionary entitlements;

    // As the XML property list that is signed. Fails for entitlements that it cannot hold.
    [[nodiscard]] std::expected<std::string, std::string> encoded() const;
    [[nodiscard]] static std::expected<SignedStatement, std::string>
    decoded(std::string_view bytes);
};

// The content of a signature file (docs/signing.md): an XML property list with "version" (1),
// "keyIdentifier", "signature" (Ed25519, RFC 8032, over `signedBytes`) and "statement" (the very
// bytes of the statement, so that nothing depends on how they would be encoded again). A plain
// value; nothing in it is to be believed before the signature was verified.
struct SignatureFile {
    static constexpr std::size_t largest = 256UL << 10;

    std::string keyIdentifier;
    std::string signature; // 64 bytes
    std::string statement;

    [[nodiscard]] std::expected<std::string, std::string> encoded() const;
    [[nodiscard]] static std::expected<SignatureFile, std::string> decoded(std::string_view bytes);

    // What is signed: the statement behind a prefix that no other use of a key has.
    [[nodiscard]] static std::string signedBytes(std::string_view statement);
};

} // namespace platform
