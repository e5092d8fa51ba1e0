#include "platform/file/File.h"
#include "tests/zpctl/ToolFixture.h"

namespace fs = std::filesystem;
using testing::AllOf;
using testing::HasSubstr;

namespace {

// Runs the verbs that sign on a home that trusts the key in keys/.
class Signing : public ToolFixture {
protected:
    Signing() {
        EXPECT_EQ(statusOf({"keygen", home_ / "keys"}), Status::done);
        fs::create_directories(home_ / "etc/trust.d");
        fs::copy(home_ / "keys/zephrin.pub.pem", home_ / "etc/trust.d");
        home_.write("may.plist", "<plist><dict><key>com.example.may</key><true/></dict></plist>");
    }

    // What it says beside.
    std::string sign(const std::string& target) const {
        const Run done =
            run({"sign", "--key", key_, "--entitlements", home_ / "may.plist", target});
        EXPECT_EQ(done.status, Status::done) << done.err;
        return done.err;
    }

    static nlohmann::json verified(const std::string& target, Status expected) {
        const Run verify = run({"--json", "verify", target});
        EXPECT_EQ(verify.status, expected) << verify.err;
        return nlohmann::json::parse(verify.out);
    }

    std::string bundle(const std::string& name, const std::string& executable) const {
        home_.write(name + "/Info.plist", "<plist><dict><key>BQBundleExecutable</key><string>" +
                                              executable + "</string></dict></plist>");
        return home_ / name;
    }

    static unsigned modeOf(const std::string& path) {
        return static_cast<unsigned>(fs::status(path).permissions());
    }

    const std::string key_ = home_ / "keys/zephrin.key.pem";
};

TEST_F(Signing, MakesAKeyOnceAndForItsOwnerAlone) {
    EXPECT_EQ(modeOf(key_), 0600U);
    EXPECT_EQ(modeOf(home_ / "keys/zephrin.pub.pem"), 0644U);
    const auto secret = [&] { return platform::readRegularFile(key_, 1000).value().bytes; };
    const std::string before = secret();
    const Run again = run({"keygen", home_ / "keys"});
    EXPECT_EQ(again.status, Status::refused);
    EXPECT_THAT(again.err, HasSubstr("File exists"));
    fs::remove(home_ / "keys/zephrin.pub.pem");
    EXPECT_EQ(statusOf({"keygen", home_ / "keys"}), Status::refused);
    EXPECT_FALSE(fs::exists(home_ / "keys/zephrin.pub.pem"));
    EXPECT_EQ(secret(), before);
}

TEST_F(Signing, SignsWhatVerifiesAfterwards) {
    const std::string tool = home_.write("tool", "a tool");
    const std::string whole = bundle("Whole.app", "Main");
    const std::string main = home_.write("Whole.app/Main", "a program");
    const std::string empty = bundle("Empty.appex", "Nothing");
    for (const auto& [signedPath, verifiedPath, signature] :
         {std::tuple{tool, tool, tool + ".signature"},
          {whole, main, whole + "/Signature"},
          {main, whole, whole + "/Signature"},
          {empty, empty, empty + "/Signature"}}) {
        EXPECT_EQ(verified(verifiedPath, Status::refused)["counts"], false);
        sign(signedPath);
        const auto answer = verified(verifiedPath, Status::done);
        EXPECT_EQ(answer["counts"], true);
        EXPECT_EQ(answer["reason"], nullptr);
        EXPECT_EQ(answer["signature"], signature);
        EXPECT_EQ(answer["trustFolder"], home_ / "etc/trust.d");
        EXPECT_EQ(answer["entitlements"], (nlohmann::json{{"com.example.may", true}}));
        fs::remove(signature);
    }
    ASSERT_EQ(statusOf({"sign", "--key", key_, tool}), Status::done);
    EXPECT_EQ(verified(tool, Status::done)["entitlements"], nlohmann::json::object());
}

TEST_F(Signing, TellsWhereAVerificationEnded) {
    const std::string tool = home_.write("tool", "a tool");
    sign(tool);
    home_.write("tool", "a TOOL");
    const Run verify = run({"verify", tool});
    EXPECT_EQ(verify.status, Status::refused);
    EXPECT_THAT(verify.out, AllOf(HasSubstr("yes  The executable has the signed size"),
                                  HasSubstr("NO   The executable has the signed content"),
                                  HasSubstr("Does not count: the executable is not")));
    fs::remove(home_ / "etc/trust.d/zephrin.pub.pem");
    const auto answer = verified(tool, Status::refused);
    EXPECT_EQ(answer["steps"].back()["claim"], "The key is trusted");
    EXPECT_EQ(answer["entitlements"], nullptr);
}

TEST_F(Signing, WarnsOfWhatOthersMayDo) {
    const std::string tool = home_.write("tool", "a tool");
    fs::permissions(tool, fs::perms(0750));
    EXPECT_EQ(sign(tool), "");
    fs::permissions(tool, fs::perms(0755));
    fs::permissions(key_, fs::perms(0640));
    EXPECT_THAT(sign(tool), AllOf(HasSubstr(key_ + " can be read by others"),
                                  HasSubstr(tool + " may be run by everybody")));
    EXPECT_THAT(verified(tool, Status::done)["notes"].dump(), HasSubstr("run by everybody"));

    const std::string whole = bundle("Whole.app", "Main");
    const std::string main = home_.write("Whole.app/Main", "a program");
    fs::permissions(whole + "/Info.plist", fs::perms(0666));
    EXPECT_THAT(verified(main, Status::refused)["notes"].dump(), HasSubstr("others could have"));
}

TEST_F(Signing, RefusesWhatItCannotSignOrRead) {
    const std::string tool = home_.write("tool", "a tool");
    const std::string list = home_.write("list.plist", "<plist><array/></plist>");
    const std::string key = "--key=" + key_;
    const std::pair<Words, Status> cases[] = {
        {{"sign", "--key", tool, tool}, Status::wrongUsage},
        {{"sign", "--key", home_ / "keys/zephrin.pub.pem", tool}, Status::wrongUsage},
        {{"sign", key, "--entitlements", list, tool}, Status::wrongUsage},
        {{"sign", key, "--entitlements", home_ / "none.plist", tool}, Status::wrongUsage},
        {{"sign", tool}, Status::wrongUsage},
        {{"sign", key, home_ / "nothing"}, Status::refused},
        {{"sign", key, home_ / "keys"}, Status::refused},
        {{"verify", home_ / "nothing"}, Status::refused},
        {{"verify", home_ / "keys"}, Status::refused},
        {{"keygen", tool}, Status::refused},
    };
    for (const auto& [arguments, status] : cases) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        const Run refused = run(arguments);
        EXPECT_EQ(refused.status, status);
        EXPECT_NE(refused.err, "");
        EXPECT_EQ(refused.out, "");
    }
    EXPECT_FALSE(fs::exists(tool + ".signature"));
}

} // namespace
