#include <cstdlib>
#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "platform/file/File.h"
#include "platform/log/Log.h"
#include "tests/platform/TestFolder.h"
#include "zpctl/CommandLine.h"

namespace fs = std::filesystem;
using testing::HasSubstr;
using zpctl::Status;

namespace {

// Runs the verbs that sign on a home that trusts the key in keys/.
class Signing : public testing::Test {
protected:
    Signing() {
        platform::log::silence();
        setenv("ZEPHRIN_HOME", home_.path().c_str(), 1);
        EXPECT_EQ(run({"keygen", home_ / "keys"}), Status::done);
        fs::create_directories(home_ / "etc/trust.d");
        fs::copy(home_ / "keys/zephrin.pub.pem", home_ / "etc/trust.d");
        home_.write("may.plist", "<plist><dict><key>com.example.may</key><true/></dict></plist>");
    }

    Status run(const std::vector<std::string>& arguments) {
        out_.str("");
        err_.str("");
        return zpctl::run(arguments, {.out = out_, .err = err_});
    }

    Status sign(const std::string& target) {
        return run({"sign", "--key", key_, "--entitlements", home_ / "may.plist", target});
    }

    nlohmann::json verified(const std::string& target, Status expected) {
        EXPECT_EQ(run({"--json", "verify", target}), expected) << err_.str();
        return nlohmann::json::parse(out_.str());
    }

    std::string bundle(const std::string& name, const std::string& executable) const {
        home_.write(name + "/Info.plist", "<plist><dict><key>BQBundleExecutable</key><string>" +
                                              executable + "</string></dict></plist>");
        return home_ / name;
    }

    static unsigned modeOf(const std::string& path) {
        return static_cast<unsigned>(fs::status(path).permissions());
    }

    const TestFolder home_;
    const std::string key_ = home_ / "keys/zephrin.key.pem";
    std::ostringstream out_;
    std::ostringstream err_;
};

TEST_F(Signing, MakesAKeyOnceAndForItsOwnerAlone) {
    EXPECT_EQ(modeOf(key_), 0600U);
    EXPECT_EQ(modeOf(home_ / "keys/zephrin.pub.pem"), 0644U);
    const auto secret = [&] { return platform::readRegularFile(key_, 1000).value().bytes; };
    const std::string before = secret();
    EXPECT_EQ(run({"keygen", home_ / "keys"}), Status::refused);
    EXPECT_THAT(err_.str(), HasSubstr("File exists"));
    fs::remove(home_ / "keys/zephrin.pub.pem");
    EXPECT_EQ(run({"keygen", home_ / "keys"}), Status::refused);
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
        ASSERT_EQ(sign(signedPath), Status::done) << err_.str();
        const auto answer = verified(verifiedPath, Status::done);
        EXPECT_EQ(answer["counts"], true);
        EXPECT_EQ(answer["reason"], nullptr);
        EXPECT_EQ(answer["signature"], signature);
        EXPECT_EQ(answer["trustFolder"], home_ / "etc/trust.d");
        EXPECT_EQ(answer["entitlements"], (nlohmann::json{{"com.example.may", true}}));
        fs::remove(signature);
    }
    ASSERT_EQ(run({"sign", "--key", key_, tool}), Status::done);
    EXPECT_EQ(verified(tool, Status::done)["entitlements"], nlohmann::json::object());
}

TEST_F(Signing, TellsWhereAVerificationEnded) {
    const std::string tool = home_.write("tool", "a tool");
    ASSERT_EQ(sign(tool), Status::done);
    home_.write("tool", "a TOOL");
    EXPECT_EQ(run({"verify", tool}), Status::refused);
    EXPECT_THAT(out_.str(), testing::AllOf(HasSubstr("yes  The executable has the signed size"),
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
    ASSERT_EQ(sign(tool), Status::done);
    EXPECT_EQ(err_.str(), "");
    fs::permissions(tool, fs::perms(0755));
    fs::permissions(key_, fs::perms(0640));
    ASSERT_EQ(sign(tool), Status::done);
    EXPECT_THAT(err_.str(), HasSubstr(key_ + " can be read by others"));
    EXPECT_THAT(err_.str(), HasSubstr(tool + " may be run by everybody"));
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
    const std::pair<std::vector<std::string>, Status> cases[] = {
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
        EXPECT_EQ(run(arguments), status) << testing::PrintToString(arguments);
        EXPECT_NE(err_.str(), "") << testing::PrintToString(arguments);
        EXPECT_EQ(out_.str(), "") << testing::PrintToString(arguments);
    }
    EXPECT_FALSE(fs::exists(tool + ".signature"));
}

} // namespace
