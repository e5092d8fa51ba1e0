#include "platform/jobs/JobManager.h"

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <future>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "Zephrin/ZPJobClient.h"
#include "platform/ipc/ClientConnection.h"
#include "platform/ipc/Loop.h"
#include "platform/jobs/JobServer.h"
#include "platform/queue/SerialQueue.h"
#include "tests/platform/TestFolder.h"
#include "tests/server/Awaited.h"
#include "tests/support/Files.h"
#include "tests/support/LogOf.h"
#include "tests/support/PeerOfProcess.h"

namespace fs = std::filesystem;
using namespace platform;
using testing::ElementsAre;
using testing::HasSubstr;

namespace {

// Makes no process: what is "launched" runs as soon as asked for, and ends when told to.
struct FakeLauncher final : Launcher {
    explicit FakeLauncher(ipc::Loop& itsLoop) : loop(itsLoop) {}

    Id launch(Launch launch, StartedBlock started, EndedBlock ended) override {
        launches.push_back(std::move(launch));
        ends.push_back(std::move(ended));
        loop.post([this, started = std::move(started)]() mutable {
            if (failure)
                started(std::unexpected(posixError(failure, "exec")));
            else
                started(Started{pid, {}, confinement});
        });
        return ends.size();
    }

    void end(Id id) override { asked.push_back(id); }

    void ended(Id id) {
        loop.post([this, id] { ends[id - 1](); });
    }

    ipc::Loop& loop;
    int failure = 0;
    pid_t pid = 4'000'000; // of nobody
    Dictionary confinement{{"wanted", Dictionary{}}};
    std::vector<Launch> launches;
    std::vector<Id> asked;
    std::vector<EndedBlock> ends;
};

// A process that does nothing, in a group of its own.
class Idler {
public:
    Idler() : pid_(::fork()) {
        if (pid_ == 0) {
            for (;;)
                ::pause();
        }
        ::setpgid(pid_, pid_);
    }

    ~Idler() { end(); }

    void end() {
        if (pid_ <= 0)
            return;
        ::kill(pid_, SIGKILL);
        ::waitpid(pid_, nullptr, 0);
        pid_ = 0;
    }

    [[nodiscard]] std::shared_ptr<const ipc::Peer> peer() const {
        auto peer = peerOfProcess(pid_);
        peer.uid = ::getuid();
        return std::make_shared<const ipc::Peer>(std::move(peer));
    }

    [[nodiscard]] pid_t pid() const { return pid_; }

private:
    pid_t pid_;
};

class JobManagerTest : public testing::Test {
protected:
    JobManagerTest() {
        setMode(executable_, 0755);
        auto made = JobServer::create(loop_, jobs_, folder_ / "jobd");
        server_ = std::move(made.value());
        server_->resume();
        loop_.start();
    }

    ~JobManagerTest() override {
        client_.reset();
        server_.reset();
        loop_.stop();
    }

    [[nodiscard]] ExternalService service(const std::string& identifier = "com.example.a",
                                          const std::string& version = "1") const {
        return {.identifier = identifier,
                .version = version,
                .uuid = Uuid{},
                .executable = executable_,
                .bundle = folder_.path(),
                .container = folder_ / "container",
                .user = std::nullopt};
    }

    static Dictionary overlay(const Dictionary& environment = {}) {
        return {{"IPCService",
                 Dictionary{{"EnvironmentVariables", environment}, {"_SandboxProfile", "plugin"}}},
                {"BQBundlePackageType", "IPC!"}};
    }

    [[nodiscard]] int add(const ExternalService& what) {
        return jobs_.addExternalService(self_, what, overlay());
    }

    // What `ask` does on the loop.
    template <class F>
    auto onLoop(F&& ask) {
        const Awaited<decltype(ask())> result;
        loop_.post([&] { result.bring(ask()); });
        return result.get();
    }

    [[nodiscard]] std::expected<ZPStartedPlugIn, Error>
    start(const std::string& identifier = "com.example.a") {
        std::promise<std::expected<ZPStartedPlugIn, Error>> result;
        client_->startPlugIn(identifier,
                             [&](auto started) { result.set_value(std::move(started)); });
        return result.get_future().get();
    }

    [[nodiscard]] std::string startError(const std::string& identifier = "com.example.a") {
        const auto started = start(identifier);
        return started ? "" : describe(started.error());
    }

    [[nodiscard]] std::vector<Launcher::Id> askedToEnd() {
        return onLoop([&] { return launcher_.asked; });
    }

    // The code comes when the instances are gone.
    [[nodiscard]] std::future<int> remove(const std::string& version = "1") {
        const auto code = std::make_shared<std::promise<int>>();
        jobs_.removeExternalService("com.example.a", version, queue_,
                                    [code](int answer) { code->set_value(answer); });
        return code->get_future();
    }

    TestFolder folder_;
    const std::string executable_ = folder_.write("program", "#!");
    std::shared_ptr<SerialQueue> queue_ = std::make_shared<SerialQueue>("killer");
    std::shared_ptr<const ipc::Peer> self_ = [] {
        auto peer = peerOfProcess(::getpid());
        peer.uid = ::getuid();
        return std::make_shared<const ipc::Peer>(std::move(peer));
    }();
    ipc::Loop loop_{"jobs"};
    FakeLauncher launcher_{loop_};
    JobManager jobs_{loop_, launcher_};
    std::unique_ptr<JobServer> server_;
    std::unique_ptr<ZPJobClient> client_ = std::make_unique<ZPJobClient>(folder_ / "jobd");
};

TEST_F(JobManagerTest, ServicesThatCannotBeRunAreNotAdded) {
    const auto executable = [this](const std::string& path) {
        ExternalService one = service();
        one.executable = path;
        return one;
    };
    const std::string text = folder_.write("text", "");
    fs::create_symlink(executable_, folder_ / "link");
    makeFifo(folder_ / "fifo");
    const std::pair<ExternalService, int> cases[] = {{executable(folder_ / "missing"), ENOENT},
                                                     {executable(folder_ / "link"), ELOOP},
                                                     {executable(folder_ / "fifo"), EACCES},
                                                     {executable(folder_.path()), EACCES},
                                                     {executable(text), EACCES},
                                                     {executable("program"), EINVAL},
                                                     {service(""), EINVAL}};
    for (const auto& [what, code] : cases)
        EXPECT_EQ(add(what), code) << what.executable;
    const std::string much(JobService::largestEnvironment, 'x');
    EXPECT_EQ(jobs_.addExternalService(self_, service(), overlay({{"A", much}})), E2BIG);
    EXPECT_EQ(jobs_.addExternalService(self_, service(), {}), EINVAL);
    Idler idler;
    const auto ended = idler.peer();
    idler.end();
    EXPECT_EQ(jobs_.addExternalService(ended, service(), overlay()), ESRCH);
}

TEST_F(JobManagerTest, AStartedPlugInGetsWhatWasAddedAndIsConnected) {
    ASSERT_EQ(jobs_.addExternalService(self_, service(),
                                       overlay({{"A", "b"}, {"C=", "d"}, {"", "e"}, {"F", 1}})),
              0);
    const auto started = start();
    ASSERT_TRUE(started) << describe(started.error());
    EXPECT_EQ(started->pid, launcher_.pid);
    const Launcher::Launch& launch = launcher_.launches.at(0);
    EXPECT_EQ(launch.environment, (Dictionary{{"A", "b"}}));
    EXPECT_EQ(launch.path, executable_);
    EXPECT_EQ(launch.confinement.profile, "plugin");
    EXPECT_EQ(launch.confinement.container, folder_ / "container");
    char byte = 'x';
    ASSERT_EQ(::send(launch.socket.get(), &byte, 1, 0), 1);
    byte = 0;
    ASSERT_EQ(::recv(started->socket.get(), &byte, 1, 0), 1);
    EXPECT_EQ(byte, 'x');
}

TEST_F(JobManagerTest, WhatTheKernelLacksIsTold) {
    const Dictionary whole{{"files", "landlock"}, {"signals", "landlock"}};
    const Dictionary part{{"files", "landlock"}, {"signals", "seccomp"}};
    ASSERT_EQ(add(service()), 0);
    for (const Dictionary& enforced : {whole, part}) {
        launcher_.confinement = {{"wanted", whole}, {"enforced", enforced}};
        const std::string log = logOf([this] { EXPECT_TRUE(start()); });
        const bool told = log.find("com.example.a is confined by " + describe(Value(part)) +
                                   "; wanted was " + describe(Value(whole))) != log.npos;
        EXPECT_EQ(told, enforced == part) << log;
    }
}

TEST_F(JobManagerTest, TheServiceAddedLastOfThoseThatFitIsStarted) {
    ExternalService second = service("com.example.a", "2");
    second.uuid.bytes[0] = 1;
    second.bundle = "/second";
    ASSERT_EQ(add(second), 0);
    ASSERT_EQ(add(service()), 0);
    ASSERT_TRUE(start());
    std::promise<bool> byUuid;
    client_->startPlugIn(second.uuid, [&](const auto& started) { byUuid.set_value(!!started); });
    ASSERT_TRUE(byUuid.get_future().get());
    EXPECT_EQ(launcher_.launches.at(0).confinement.bundle, folder_.path());
    EXPECT_EQ(launcher_.launches.at(1).confinement.bundle, "/second");
}

TEST_F(JobManagerTest, WhatAHostWasNotGivenIsNotStarted) {
    const Idler other;
    ASSERT_EQ(jobs_.addExternalService(other.peer(), service(), overlay()), 0);
    EXPECT_THAT(startError(), HasSubstr("Zephrin error 15"));
    ASSERT_EQ(add(service()), 0);
    launcher_.failure = EACCES;
    EXPECT_THAT(startError(), HasSubstr("cannot start plug-in com.example.a: exec"));
    launcher_.failure = 0;
    fs::last_write_time(executable_, fs::file_time_type::clock::now());
    EXPECT_THAT(startError(), HasSubstr("has changed since it was made ready"));
    fs::remove(executable_);
    EXPECT_THAT(startError(), HasSubstr("cannot open the executable"));
    EXPECT_EQ(launcher_.launches.size(), 1U);
}

TEST_F(JobManagerTest, MalformedRequestsAreRefusedAndOthersServed) {
    ipc::ClientConnection raw(folder_ / "jobd", queue_);
    raw.resume();
    const auto codeOf = [&](const Dictionary& request) {
        std::promise<std::string> code;
        raw.sendWithReply(request, [&](auto reply) {
            const Value* const value = reply ? reply->find("errorcode") : nullptr;
            code.set_value(value ? describe(*value) : "none");
        });
        return code.get_future().get();
    };
    ASSERT_EQ(add(service()), 0);
    const std::pair<Dictionary, std::string> cases[] = {
        {{}, "4"},
        {{{"request", 1}}, "4"},
        {{{"request", "stop"}}, "4"},
        {{{"request", "start"}}, "4"},
        {{{"request", "start"}, {"identifier", 1}}, "4"},
        {{{"request", "start"}, {"identifier", "com.example.a"}, {"version", 1}}, "4"},
        {{{"request", "start"}, {"identifier", "com.example.a"}, {"uuid", "1"}}, "4"},
        {{{"request", "start"}, {"identifier", "com.example.a"}, {"version", "2"}}, "15"},
        {{{"request", "start"}, {"identifier", "com.example.a"}, {"version", "1"}}, "none"},
        {{{"request", "list"}}, "none"}};
    for (const auto& [request, code] : cases)
        EXPECT_EQ(codeOf(request), code) << describe(request);
}

TEST_F(JobManagerTest, ARemovalIsAnsweredWhenAllInstancesAreGone) {
    EXPECT_EQ(remove().get(), Jobs::nothingOnRecord);
    ASSERT_EQ(add(service()), 0);
    EXPECT_EQ(remove().get(), Jobs::nothingOnRecord);
    EXPECT_THAT(startError(), HasSubstr("error 15")) << "removed all the same";
    ASSERT_EQ(add(service()), 0);
    ASSERT_TRUE(start());
    ASSERT_TRUE(start());
    EXPECT_EQ(remove("2").get(), Jobs::nothingOnRecord) << "of another version";
    EXPECT_EQ(jobs_.busyInstances({"com.example.a", "com.example.b"}).size(), 2U);
    auto code = remove();
    EXPECT_THAT(askedToEnd(), ElementsAre(1U, 2U));
    launcher_.ended(1);
    ASSERT_EQ(askedToEnd().size(), 2U);
    queue_->sync([] {});
    EXPECT_EQ(code.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
    launcher_.ended(2);
    EXPECT_EQ(code.get(), 0);
    EXPECT_TRUE(jobs_.busyInstances({"com.example.a"}).empty());
    EXPECT_EQ(jobs_.instances(), Array());
}

TEST_F(JobManagerTest, WhatIsAddedAfterARemovalStays) {
    ASSERT_EQ(add(service()), 0);
    ASSERT_TRUE(start());
    std::promise<void> resumed;
    loop_.post([&] { resumed.get_future().wait(); });
    auto code = remove();
    ASSERT_EQ(add(service()), 0);
    resumed.set_value();
    EXPECT_THAT(askedToEnd(), ElementsAre(1U));
    EXPECT_EQ(startError(), "");
    launcher_.ended(1);
    EXPECT_EQ(code.get(), 0) << "not for the new one";
}

TEST_F(JobManagerTest, NobodyGetsMoreThanTheLimits) {
    for (std::size_t i = 0; i < JobHosts::servicesOfHost; ++i)
        ASSERT_EQ(add(service("com.example.a", std::to_string(i))), 0);
    EXPECT_EQ(add(service("com.example.a", "new")), EDQUOT);
    EXPECT_EQ(add(service("com.example.a", "7")), 0) << "in place of another";
    for (std::size_t i = 0; i < JobManager::instancesOfUser; ++i)
        ASSERT_TRUE(start());
    EXPECT_THAT(startError(), HasSubstr("too many plug-ins"));
    launcher_.ended(1);
    EXPECT_EQ(startError(), "");
}

TEST_F(JobManagerTest, ProcessesOfAnInstanceAreShutOut) {
    const Idler plugIn;
    ASSERT_EQ(add(service()), 0);
    EXPECT_FALSE(jobs_.isShutOut(*plugIn.peer()));
    launcher_.pid = plugIn.pid();
    ASSERT_TRUE(start());
    EXPECT_TRUE(jobs_.isShutOut(*plugIn.peer()));
    EXPECT_FALSE(jobs_.isShutOut(*self_));
    launcher_.ended(1);
    ASSERT_TRUE(askedToEnd().empty());
    EXPECT_FALSE(jobs_.isShutOut(*plugIn.peer()));
}

} // namespace
