#pragma once

#include <expected>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/file/File.h"
#include "platform/ipc/Loop.h"
#include "platform/jobs/LauncherProcess.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Gate.h"

namespace tests {

// As which launched programs run when the tests are root.
inline constexpr uid_t launchedUser = 1'879'050'000;

// A process, whoever is its parent.
class Other {
public:
    explicit Other(pid_t pid);

    // Within some seconds; nor is it a zombie then.
    [[nodiscard]] bool vanishes() const;
    // At this moment.
    [[nodiscard]] bool isThere() const;

private:
    pid_t pid_;
    platform::UniqueFd process_;
};

// One launch, as it goes on; and the talk with its program.
struct Launched {
    using Told = std::expected<platform::Launcher::Started, platform::Error>;

    // Empty when it failed, or nothing came.
    [[nodiscard]] const platform::Launcher::Started* started() const;
    // Nothing when it did not fail.
    [[nodiscard]] std::optional<platform::Error> error() const;
    void say(const std::string& line);
    // Sends a line; the line that answers. "" when none comes.
    std::string ask(const std::string& line);
    // The next line.
    std::string hear();
    // Has the program make a process.
    Other make(const std::string& kind);

    platform::Launcher::Id id = 0;
    Signal<std::shared_ptr<Told>> told;
    Signal<> ended;
    platform::UniqueFd socket;
};

// What the job manager is to the launcher: a loop that it lives on, a bundle with the probe, and a
// container.
class Host {
public:
    // With this program in the launcher's place, if any.
    explicit Host(const std::string& launcher = {});
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;
    ~Host();

    // Of the bundle's probe, in the usual way.
    [[nodiscard]] platform::Launcher::Launch usual() const;
    [[nodiscard]] Launched launch(platform::Launcher::Launch launch);
    // The same, and the program has said that it is ready.
    [[nodiscard]] Launched start();
    void end(const Launched& run);
    [[nodiscard]] pid_t launcherPid();

    // Where the launcher and the probe are.
    [[nodiscard]] static std::string programs();

    [[nodiscard]] const TestFolder& folder() const { return folder_; }

    [[nodiscard]] std::string container() const { return folder_ / "container"; }

private:
    void onLoop(const std::function<void()>& act);

    TestFolder folder_;
    platform::ipc::Loop loop_{"jobs"};
    std::unique_ptr<platform::LauncherProcess> launcher_;
};

} // namespace tests
