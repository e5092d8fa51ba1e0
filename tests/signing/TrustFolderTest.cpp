#include "platform/signing/TrustFolder.h"

#include <filesystem>
#include <set>

#include <gtest/gtest.h>

#include "platform/log/Log.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"

namespace fs = std::filesystem;
using namespace platform;

namespace {

class TrustFolderTest : public testing::Test {
protected:
    TrustFolderTest() { log::silence(); }

    // Puts a new key into the folder, and answers its identifier.
    std::string addKey(const std::string& name) {
        const auto key = PrivateKey::generate()->publicKey().value();
        home_.write("trust.d/" + name, key.pem());
        return key.identifier();
    }

    std::set<std::string> trusted() {
        std::set<std::string> identifiers;
        for (const auto& [identifier, key] : *folder_.keys())
            identifiers.insert(identifier);
        return identifiers;
    }

    using Keys = std::set<std::string>;

    const TestFolder home_;
    const std::string path_ = home_ / "trust.d";
    TrustFolder folder_{path_};
};

TEST_F(TrustFolderTest, FollowsWhatChangesAtOnce) {
    EXPECT_EQ(trusted(), Keys());
    const std::string a = addKey("a.pem");
    EXPECT_EQ(trusted(), Keys{a});
    const std::string b = addKey("b.pem");
    EXPECT_EQ(trusted(), (Keys{a, b}));
    const std::string c = addKey("a.pem"); // of the same size, in place
    EXPECT_EQ(trusted(), (Keys{b, c}));
    fs::rename(path_ + "/b.pem", path_ + "/b.off");
    EXPECT_EQ(trusted(), Keys{c});
    fs::remove_all(path_);
    EXPECT_EQ(trusted(), Keys());
}

TEST_F(TrustFolderTest, GivesTheSameObjectAsLongAsTheKeysAreTheSame) {
    addKey("a.pem");
    const auto keys = folder_.keys();
    EXPECT_EQ(folder_.keys(), keys);
    home_.write("trust.d/unrelated", "text");
    EXPECT_EQ(folder_.keys(), keys);
    addKey("b.pem");
    EXPECT_NE(folder_.keys(), keys);
}

TEST_F(TrustFolderTest, IgnoresWhatIsNoSoundKey) {
    const std::string good = addKey("good.pem");
    home_.write("trust.d/text.pem", "no key");
    home_.write("trust.d/large.pem", std::string(TrustFolder::largestKey + 1, '\n'));
    addKey("good.txt");
    addKey(".hidden.pem");
    addKey("writable.pem");
    setMode(path_ + "/writable.pem", 0664);
    addKey("elsewhere");
    fs::create_symlink("elsewhere", path_ + "/link.pem");
    fs::create_directory(path_ + "/folder.pem");
    makeFifo(path_ + "/fifo.pem");
    EXPECT_EQ(trusted(), Keys{good});
}

TEST_F(TrustFolderTest, TakesNoMoreKeysThanItsLimit) {
    for (std::size_t i = 0; i <= TrustFolder::mostKeys; ++i)
        addKey(std::to_string(i) + ".pem");
    EXPECT_EQ(trusted().size(), TrustFolder::mostKeys);
}

TEST_F(TrustFolderTest, CountsOnlyWhileNobodyElseCanWriteItOrAFolderAbove) {
    const Keys good{addKey("a.pem")};
    for (const std::string& folder : {path_, home_.path()}) {
        EXPECT_EQ(trusted(), good);
        setMode(folder, 0777);
        EXPECT_EQ(trusted(), Keys()) << folder;
        setMode(folder, 0755);
    }
    EXPECT_EQ(trusted(), good);
    if (::geteuid() != 0)
        return;
    for (const std::string& owned : {path_, path_ + "/a.pem"}) {
        giveAway(owned);
        EXPECT_EQ(trusted(), Keys()) << owned;
        giveAway(owned, 0);
    }
    EXPECT_EQ(trusted(), good);
}

} // namespace
