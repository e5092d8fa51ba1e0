#include "platform/signing/Ed25519.h"

#include <array>
#include <climits>

#include <openssl/bio.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>

#include "platform/digest/Sha256.h"
#include "platform/value/Hex.h"

namespace platform {

namespace {

constexpr const char* algorithm = "ED25519";
constexpr std::size_t signatureSize = 64;

template <auto release>
struct Release {
    template <class T>
    void operator()(T* thing) const {
        release(thing);
    }
};

using Bio = std::unique_ptr<BIO, Release<BIO_free>>;
using Key = std::unique_ptr<EVP_PKEY, Release<EVP_PKEY_free>>;
using Context = std::unique_ptr<EVP_MD_CTX, Release<EVP_MD_CTX_free>>;

// Nobody is there to be asked: an encrypted key cannot be read.
int noPassword(char* /*room*/, int /*size*/, int /*writing*/, void* /*context*/) {
    return -1;
}

Bio readerOf(std::string_view text) {
    if (text.size() > INT_MAX)
        return nullptr;
    return Bio(BIO_new_mem_buf(text.data(), static_cast<int>(text.size())));
}

std::string textIn(const Bio& bio) {
    char* text = nullptr;
    const long size = BIO_get_mem_data(bio.get(), &text);
    return size > 0 ? std::string(text, static_cast<std::size_t>(size)) : std::string();
}

bool isEd25519(const Key& key) {
    ERR_clear_error(); // what a failed reader left behind
    return key && EVP_PKEY_is_a(key.get(), algorithm) == 1;
}

const unsigned char* bytesOf(std::string_view text) {
    return reinterpret_cast<const unsigned char*>(text.data());
}

std::string hexadecimal(const Sha256Digest& digest) {
    std::string text;
    for (const std::uint8_t byte : digest)
        appendHex(text, byte);
    return text;
}

// The key's SubjectPublicKeyInfo in DER.
std::string encodedPublicKey(EVP_PKEY* key) {
    unsigned char* bytes = nullptr;
    const int size = i2d_PUBKEY(key, &bytes);
    const std::unique_ptr<unsigned char, Release<[](unsigned char* p) { OPENSSL_free(p); }>> owner(
        bytes);
    if (size <= 0)
        return {};
    return {reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(size)};
}

} // namespace

struct PublicKey::Impl {
    Key key;
};

PublicKey::PublicKey(std::shared_ptr<const Impl> impl)
    : impl_(std::move(impl)),
      identifier_(hexadecimal(Sha256().of(encodedPublicKey(impl_->key.get())))) {}

std::expected<PublicKey, std::string> PublicKey::fromPem(std::string_view pem) {
    const Bio bio = readerOf(pem);
    Key key(bio ? PEM_read_bio_PUBKEY(bio.get(), nullptr, noPassword, nullptr) : nullptr);
    if (!isEd25519(key))
        return std::unexpected("not a public Ed25519 key in PEM form");
    return PublicKey(std::make_shared<const Impl>(std::move(key)));
}

bool PublicKey::verifies(std::string_view message, std::string_view signature) const {
    const Context context(EVP_MD_CTX_new());
    const bool verified =
        context && signature.size() == signatureSize &&
        EVP_DigestVerifyInit(context.get(), nullptr, nullptr, nullptr, impl_->key.get()) == 1 &&
        EVP_DigestVerify(context.get(), bytesOf(signature), signature.size(), bytesOf(message),
                         message.size()) == 1;
    if (!verified)
        ERR_clear_error();
    return verified;
}

std::string PublicKey::pem() const {
    const Bio bio(BIO_new(BIO_s_mem()));
    if (!bio || PEM_write_bio_PUBKEY(bio.get(), impl_->key.get()) != 1)
        return {};
    return textIn(bio);
}

PrivateKey::PrivateKey(std::shared_ptr<const PublicKey::Impl> impl) : impl_(std::move(impl)) {}

std::expected<PrivateKey, std::string> PrivateKey::generate() {
    Key key(EVP_PKEY_Q_keygen(nullptr, nullptr, algorithm));
    if (!isEd25519(key))
        return std::unexpected("the crypto library makes no Ed25519 keys");
    return PrivateKey(std::make_shared<const PublicKey::Impl>(std::move(key)));
}

std::expected<PrivateKey, std::string> PrivateKey::fromPem(std::string_view pem) {
    const Bio bio = readerOf(pem);
    Key key(bio ? PEM_read_bio_PrivateKey(bio.get(), nullptr, noPassword, nullptr) : nullptr);
    if (!isEd25519(key))
        return std::unexpected("not a private Ed25519 key in PEM form without password");
    return PrivateKey(std::make_shared<const PublicKey::Impl>(std::move(key)));
}

std::expected<PublicKey, std::string> PrivateKey::publicKey() const {
    return PublicKey::fromPem(PublicKey(impl_).pem()); // which leaves the private half behind
}

std::expected<std::string, std::string> PrivateKey::sign(std::string_view message) const {
    const Context context(EVP_MD_CTX_new());
    std::array<unsigned char, signatureSize> signature;
    std::size_t size = signature.size();
    const bool made =
        context &&
        EVP_DigestSignInit(context.get(), nullptr, nullptr, nullptr, impl_->key.get()) == 1 &&
        EVP_DigestSign(context.get(), signature.data(), &size, bytesOf(message), message.size()) ==
            1 &&
        size == signature.size();
    if (!made) {
        ERR_clear_error();
        return std::unexpected("the crypto library cannot sign");
    }
    return std::string(reinterpret_cast<const char*>(signature.data()), size);
}

std::string PrivateKey::pem() const {
    const Bio bio(BIO_new(BIO_s_mem()));
    if (!bio || PEM_write_bio_PKCS8PrivateKey(bio.get(), impl_->key.get(), nullptr, nullptr, 0,
                                              nullptr, nullptr) != 1)
        return {};
    return textIn(bio);
}

} // namespace platform
