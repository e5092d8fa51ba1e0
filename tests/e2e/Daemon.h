#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

#include "tests/e2e/WireClient.h"

namespace e2e {

// A running program of this build, with its standard error in a file. Killed when this goes,
// unless it has ended by then. One thread: the process dies with the thread that started it.
class Program {
public:
    struct Start {
        std::vector<std::string> command;                          // the program's path first
        std::vector<std::pair<std::string, std::string>> settings; // the environment, beside basics
        std::string errorFile;
        std::string inputFile = "/dev/null";
        std::string outputFile = "/dev/null";
        std::optional<std::uint64_t> descriptors; // limit, soft and hard
        std::optional<uid_t> user{};              // and group; without it that of the tests
        int inputFd = -1;                         // in place of the files
        int outputFd = -1;
    };

    explicit Program(const Start& start);
    Program(const Program&) = delete;
    Program& operator=(const Program&) = delete;
    ~Program();

    [[nodiscard]] pid_t pid() const { return pid_; }

    void signal(int number) const;
    [[nodiscard]] bool running();
    // The exit status, or 128 and the number of the signal that ended it. Waits for the end.
    int exitStatus(std::chrono::milliseconds patience = 20s);
    [[nodiscard]] std::string errors() const; // what stands on standard error so far

private:
    pid_t pid_ = -1;
    std::optional<int> status_;
    std::string errorFile_;
};

// The path of a program of this build.
[[nodiscard]] std::string builtProgram(const char* name);

// The daemon on a home folder, ready to be connected to. Must not outlive the home.
class Daemon {
public:
    struct Options {
        std::string program = builtProgram("zpd");
        std::string service = "e2e";
        std::vector<std::string> arguments;
        std::string logLevel = "debug";
        std::optional<std::uint64_t> descriptors;
        std::optional<uid_t> user{};
        bool waitUntilReady = true;
    };

    explicit Daemon(const std::string& home) : Daemon(home, Options{}) {}

    Daemon(const std::string& home, const Options& options);

    [[nodiscard]] const std::string& socketPath() const { return socketPath_; }

    [[nodiscard]] WireClient connect() const { return WireClient(socketPath_); }

    [[nodiscard]] pid_t pid() const { return program_.pid(); }

    [[nodiscard]] Program& program() { return program_; }

    // SIGTERM, and the exit status.
    int terminate();

    // The log so far, line by line: "time zpd[pid] category level: text".
    [[nodiscard]] std::vector<std::string> log() const;

    [[nodiscard]] std::string wholeLog() const { return program_.errors(); }

    [[nodiscard]] std::size_t linesWith(std::string_view text) const;
    // Waits until a line holds the text.
    [[nodiscard]] bool logs(std::string_view text, std::chrono::milliseconds patience = 10s) const;
    // Bytes of memory that are the daemon's own.
    [[nodiscard]] std::size_t ownMemory() const;

private:
    std::string socketPath_;
    Program program_;
};

} // namespace e2e
