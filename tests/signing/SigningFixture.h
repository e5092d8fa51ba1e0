#pragma once

#include <string>

#include <gtest/gtest.h>

#include "platform/log/Log.h"
#include "platform/plist/PropertyList.h"
#include "platform/signing/Ed25519.h"
#include "platform/signing/SignedFiles.h"
#include "platform/signing/Signer.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"

// A home with a trusted key, and programs and bundles in it that are signed with that key.
class SigningFixture : public testing::Test {
protected:
    SigningFixture() {
        platform::log::silence();
        home_.write("trust.d/key.pem", key_.publicKey()->pem());
    }

    std::string program(const std::string& name) const {
        return home_.write(name, "the program " + name);
    }

    // With an executable "Main" if there is to be one.
    std::string bundle(const std::string& name, bool withExecutable = true) const {
        home_.write(name + "/Info.plist",
                    platform::plist::writeXml(
                        platform::Dictionary{{"BQBundleIdentifier", "com.example." + name},
                                             {"BQBundleExecutable", "Main"}})
                        .value());
        if (withExecutable)
            program(name + "/Main");
        return home_ / name;
    }

    platform::SignedFiles signedBundle(const std::string& name) const {
        return sign(platform::SignedFiles::ofBundle(bundle(name)).value());
    }

    platform::SignedFiles sign(const platform::SignedFiles& files,
                               const platform::Dictionary& entitlements = {{"may", true}}) const {
        const auto failure = platform::Signer(key_).sign(files, entitlements);
        EXPECT_EQ(failure, std::nullopt);
        return files;
    }

    const TestFolder home_;
    const platform::PrivateKey key_ = platform::PrivateKey::generate().value();
};
