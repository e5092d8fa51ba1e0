#include "platform/signing/Verifier.h"

#include <functional>
#include <unistd.h>

#include <gmock/gmock.h>

#include "tests/signing/SigningFixture.h"

namespace fs = std::filesystem;
using namespace platform;
using testing::HasSubstr;

namespace {

class VerifierTest : public SigningFixture {
protected:
    void alter(const std::string& path, std::size_t at = 20) {
        std::fstream(path).seekp(at).put('!');
    }

    // Signs `files` anew as `change` wants the statement to be.
    void forge(const SignedFiles& files, const std::function<void(SignedStatement&)>& change) {
        const auto file = SignatureFile::decoded(contentOf(files.signature())).value();
        auto statement = SignedStatement::decoded(file.statement).value();
        change(statement);
        const std::string bytes = statement.encoded().value();
        const std::string signature = key_.sign(SignatureFile::signedBytes(bytes)).value();
        const SignatureFile forged{file.keyIdentifier, signature, bytes};
        std::ofstream(files.signature()) << forged.encoded().value();
    }

    Verifier verifier_{home_ / "trust.d"};
};

TEST_F(VerifierTest, GrantsWhatWasSigned) {
    const Dictionary entitlements{{"may", true}, {"until", Array{1, "x"}}};
    const auto lone = sign({std::nullopt, program("lone")}, entitlements);
    const auto whole = sign(SignedFiles::ofBundle(bundle("Whole.app")).value(), entitlements);
    const auto empty =
        sign(SignedFiles::ofBundle(bundle("Empty.appex", false)).value(), entitlements);
    for (const Verification& result :
         {verifier_.program(*lone.executable), verifier_.program(*whole.executable),
          verifier_.bundle(whole), verifier_.bundle(empty)}) {
        ASSERT_EQ(result.refusal(), std::nullopt);
        EXPECT_EQ(result.grant().entitlements, entitlements);
        EXPECT_EQ(result.grant().key, key_.publicKey()->identifier());
    }
    EXPECT_EQ(verifier_.bundle(whole).statement()->identifier, "com.example.Whole.app");
    EXPECT_EQ(verifier_.program(*lone.executable).statement()->identifier, "lone");
}

TEST_F(VerifierTest, RefusesWhateverIsNotAsItWasSigned) {
    static constexpr std::uintmax_t terabyte = std::uintmax_t{1} << 40;

    const std::tuple<const char*, std::function<void(const SignedFiles&)>, const char*> cases[] = {
        {"unsigned", [](const auto& f) { fs::remove(f.signature()); }, "not signed"},
        {"one byte of the executable", [&](const auto& f) { alter(*f.executable); },
         "the executable is not what it was"},
        {"a longer executable", [&](const auto& f) { alter(*f.executable, 1000); },
         "the executable has 1001 bytes"},
        {"a sparse executable of 1 TB",
         [](const auto& f) { fs::resize_file(*f.executable, terabyte); },
         "the executable has 1099511627776 bytes"},
        {"the same, and signed so",
         [&](const auto& f) {
             fs::resize_file(*f.executable, terabyte);
             forge(f, [](auto& statement) { statement.executable->size = terabyte; });
         },
         "larger than 268435456 bytes"},
        {"a replaced executable with another's signature",
         [&](const auto& f) { forge(f, [](SignedStatement& s) { s.executable->digest[0] ^= 1; }); },
         "the executable is not what it was"},
        {"one byte of Info.plist",
         [&](const auto& f) { alter(*f.info(), contentOf(*f.info()).find("Main.app")); },
         "Info.plist is not what it was"},
        {"a broken signature file", [&](const auto& f) { alter(f.signature(), 60); },
         "the signature file: "},
        {"an oversized signature file",
         [](const auto& f) { fs::resize_file(f.signature(), SignatureFile::largest + 1); },
         "larger than allowed"},
        {"signed for a lone executable",
         [&](const auto& f) { forge(f, [](SignedStatement& s) { s.info.reset(); }); },
         "signed was an executable outside a bundle"},
        {"signed without executable",
         [&](const auto& f) { forge(f, [](SignedStatement& s) { s.executable.reset(); }); },
         "signed was a bundle without executable"},
        {"signed with a key that is not trusted",
         [](const auto& f) {
             const Signer stranger(PrivateKey::generate().value());
             EXPECT_EQ(stranger.sign(f, {}), std::nullopt);
         },
         "is not trusted"},
        {"an executable that others can write", [](const auto& f) { setMode(*f.executable, 0775); },
         "Main can be written by others"},
        {"an Info.plist that others can write", [](const auto& f) { setMode(*f.info(), 0666); },
         "can be written by others"},
        {"a signature file that others can write",
         [](const auto& f) { setMode(f.signature(), 0664); }, "Signature can be written by others"},
        {"a folder that others can write", [](const auto& f) { setMode(*f.bundle, 0777); },
         "Main.app can be written by others"},
        {"a folder above that others can write", [&](const auto&) { setMode(home_.path(), 0777); },
         "can be written by others"},
        {"a signature file behind a link",
         [](const auto& f) {
             fs::rename(f.signature(), *f.bundle + "/elsewhere");
             fs::create_symlink("elsewhere", f.signature());
         },
         "Signature"},
        {"a FIFO for a signature file", [](const auto& f) { makeFifo(f.signature()); },
         "not a regular file"},
        {"the key is gone", [&](const auto&) { fs::remove_all(home_ / "trust.d"); },
         "is not trusted"},
    };

    for (const auto& [what, tamper, reason] : cases) {
        SCOPED_TRACE(what);
        const auto files = signedBundle("Main.app");
        ASSERT_EQ(verifier_.bundle(files).refusal(), std::nullopt);
        tamper(files);
        EXPECT_THAT(verifier_.bundle(files).refusal().value_or("granted"), HasSubstr(reason));
        EXPECT_NE(verifier_.program(*files.executable).refusal(), std::nullopt);
        fs::remove_all(*files.bundle);
        setMode(home_.path(), 0755);
    }
}

TEST_F(VerifierTest, RefusesABundleWhoseExecutableLiesElsewhere) {
    const std::string tool = program("bin/tool");
    fs::create_symlink(tool, bundle("Main.app", false) + "/Main");
    const auto files = sign(SignedFiles::ofBundle(home_ / "Main.app").value());
    ASSERT_EQ(files.executable, tool);
    EXPECT_THAT(verifier_.bundle(files).refusal().value_or("granted"),
                HasSubstr("does not belong"));
    EXPECT_THAT(verifier_.program(tool).refusal().value_or("granted"), HasSubstr("not signed"));
}

TEST_F(VerifierTest, TakesNoFilesOfStrangers) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "only root can give files away";
    const auto files = signedBundle("Main.app");
    for (const std::string& owned :
         {*files.executable, *files.info(), files.signature(), *files.bundle, home_ / "trust.d"}) {
        giveAway(owned);
        EXPECT_NE(verifier_.bundle(files).refusal(), std::nullopt) << owned;
        giveAway(owned, 0);
        EXPECT_EQ(verifier_.bundle(files).refusal(), std::nullopt) << owned;
    }
}

TEST_F(VerifierTest, NoByteOfASignatureFileMayChange) {
    const auto files = sign({std::nullopt, program("lone")});
    const std::string sound = contentOf(files.signature());
    const TrustedKeys keys = *verifier_.trust().keys();
    for (std::size_t at = 0; at < sound.size(); ++at) {
        std::string damaged = sound;
        damaged[at] = static_cast<char>(damaged[at] ^ 1);
        Verification result;
        EXPECT_FALSE(result.checkSignature(damaged, keys)) << at;
    }
}

TEST_F(VerifierTest, TellsHowFarASignatureCame) {
    const auto files = sign({std::nullopt, program("lone")});
    alter(*files.executable, 3);
    const Verification result = verifier_.program(*files.executable);
    for (std::size_t i = 0; i < result.steps().size(); ++i)
        EXPECT_EQ(result.steps()[i].passed, i + 1 < result.steps().size());
    EXPECT_THAT(result.steps().back().claim, HasSubstr("signed content"));
    EXPECT_EQ(result.key(), key_.publicKey()->identifier());
}

} // namespace
