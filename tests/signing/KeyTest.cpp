#include <gtest/gtest.h>

#include "platform/signing/Ed25519.h"

using namespace platform;

namespace {

TEST(KeyTest, SignsForItsOwnPublicHalfAlone) {
    const auto key = PrivateKey::fromPem(PrivateKey::generate()->pem()).value();
    const auto publicKey = PublicKey::fromPem(key.publicKey()->pem()).value();
    EXPECT_EQ(publicKey.identifier().size(), 64U);
    const std::string signature = key.sign("message").value();
    EXPECT_TRUE(publicKey.verifies("message", signature));
    EXPECT_FALSE(publicKey.verifies("massage", signature));
    EXPECT_FALSE(publicKey.verifies("message", signature + "x"));
    EXPECT_FALSE(publicKey.verifies("message", ""));
    const auto other = PrivateKey::generate()->publicKey().value();
    EXPECT_NE(other.identifier(), publicKey.identifier());
    EXPECT_FALSE(other.verifies("message", signature));
}

// The key of RFC 8410, section 10.1; its identifier by `openssl pkey -pubin -outform DER`.
TEST(KeyTest, IsReadFromPemOfItsOwnKindAlone) {
    const std::string known = "-----BEGIN PUBLIC KEY-----\n"
                              "MCowBQYDK2VwAyEAGb9ECWmEzf6FQbrBZ9w7lshQhqowtrbLDFw4rXAxZuE=\n"
                              "-----END PUBLIC KEY-----\n";
    EXPECT_EQ(PublicKey::fromPem(known)->identifier(),
              "a1e9156054e04fac899ae9f275132cdc07a5dbc4ea2c2ad3a1ffc6e0d253681f");
    const std::string p256 = "-----BEGIN PUBLIC KEY-----\n"
                             "MFkwEwYHKoZIzj0CAQYIKoZIzj0DAQcDQgAE+AzNvLUGxMI3lHFRSCdYxD16JZIk\n"
                             "Ip/U7SiJf5MNStWzQutsE/g+k8nPm2MhJWgO7girq4+g/nKdHaS0d7h43Q==\n"
                             "-----END PUBLIC KEY-----\n";
    const std::string secret = PrivateKey::generate()->pem();
    for (const std::string& text : {std::string(), std::string("x"), p256, secret})
        EXPECT_FALSE(PublicKey::fromPem(text)) << text;
    for (const std::string& text : {std::string(), known, secret.substr(0, secret.size() / 2)})
        EXPECT_FALSE(PrivateKey::fromPem(text)) << text;
}

} // namespace
