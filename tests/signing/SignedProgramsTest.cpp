#include "platform/signing/SignedPrograms.h"

#include <chrono>
#include <fcntl.h>
#include <future>
#include <thread>

#include "tests/signing/SigningFixture.h"

namespace fs = std::filesystem;
using namespace platform;

namespace {

class SignedProgramsTest : public SigningFixture {
protected:
    // As of a client that runs the program.
    std::unique_ptr<SigningTask> taskOf(const std::string& path) {
        auto peer = std::make_shared<ipc::Peer>();
        peer->executable = UniqueFd(::open(path.c_str(), O_PATH | O_CLOEXEC));
        return service_.taskFor(std::move(peer));
    }

    static bool may(SigningTask& task) { return task.entitlement("may").value() == Value(true); }

    static bool mayOncePrepared(SigningTask& task) {
        std::promise<void> done;
        task.prepare([&] { done.set_value(); });
        done.get_future().wait();
        return may(task);
    }

    // Files that changed just now are looked at again and again, which is not what is tested.
    static void letFilesSettle() { std::this_thread::sleep_for(std::chrono::milliseconds(30)); }

    SignedPrograms service_{home_ / "trust.d"};
};

TEST_F(SignedProgramsTest, GivesNothingToOthersAsLongAsTheyAreConnected) {
    const auto nowhere = service_.taskFor(std::make_shared<ipc::Peer>());
    EXPECT_FALSE(mayOncePrepared(*nowhere));
    const std::string path = program("later");
    const auto task = taskOf(path);
    EXPECT_FALSE(mayOncePrepared(*task));
    sign({std::nullopt, path});
    EXPECT_FALSE(mayOncePrepared(*task));
    EXPECT_TRUE(mayOncePrepared(*taskOf(path)));
}

TEST_F(SignedProgramsTest, KnowsAReplacedProgramFromTheOneThatRuns) {
    const auto files = sign({std::nullopt, program("tool")});
    const auto task = taskOf(*files.executable);
    fs::copy_file(*files.executable, home_ / "copy");
    fs::rename(home_ / "copy", *files.executable);
    EXPECT_FALSE(mayOncePrepared(*task));
    EXPECT_TRUE(mayOncePrepared(*taskOf(*files.executable)));
    fs::remove(*files.executable);
    EXPECT_FALSE(mayOncePrepared(*taskOf(home_ / "nothing")));
}

TEST_F(SignedProgramsTest, TakesEntitlementsBackWhenWhatTheyRestOnChanges) {
    const auto files = signedBundle("Main.app");
    const std::string key = home_ / "trust.d/key.pem";
    const std::string elsewhere = home_ / "key.off";
    letFilesSettle();
    const auto task = taskOf(*files.executable);
    EXPECT_FALSE(may(*task)) << "not prepared";
    for (const std::string& file : {*files.executable, *files.info(), files.signature(), key}) {
        ASSERT_TRUE(mayOncePrepared(*task));
        task->recheck();
        ASSERT_TRUE(may(*task));
        fs::rename(file, elsewhere);
        task->recheck();
        EXPECT_FALSE(may(*task)) << file;
        fs::rename(elsewhere, file);
        letFilesSettle(); // renaming changes a file
    }
    EXPECT_TRUE(mayOncePrepared(*task));
    EXPECT_EQ(task->entitlement("else").value(), std::nullopt);
    home_.write("trust.d/another.pem", PrivateKey::generate()->publicKey()->pem());
    task->recheck();
    EXPECT_TRUE(may(*task));
}

TEST_F(SignedProgramsTest, VerifiesABundleFromWhatIsKnownOfIt) {
    const auto files = signedBundle("Main.app");
    Sha256 hash;
    const std::string signature = contentOf(files.signature());
    const SignedBundle sound{signature, hash.ofFile(*files.info()).value(),
                             SignedBundle::Executable{fs::file_size(*files.executable),
                                                      hash.ofFile(*files.executable).value()}};
    const auto grant = service_.verifyBundle(sound);
    ASSERT_TRUE(grant) << grant.error();
    EXPECT_EQ(grant->entitlements, (Dictionary{{"may", true}}));
    EXPECT_TRUE(service_.isTrusted(grant->key));

    SignedBundle altered[] = {sound, sound, sound, sound, sound};
    altered[0].signature = "";
    altered[1].info[31] ^= 1;
    altered[2].executable->size += 1;
    altered[3].executable->digest[0] ^= 1;
    altered[4].executable.reset();
    for (const SignedBundle& bundle : altered)
        EXPECT_FALSE(service_.verifyBundle(bundle)) << &bundle - altered;
    fs::remove(home_ / "trust.d/key.pem");
    EXPECT_FALSE(service_.verifyBundle(sound));
    EXPECT_FALSE(service_.isTrusted(grant->key));
}

} // namespace
