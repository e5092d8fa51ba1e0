#include "tests/e2e/Signing.h"

#include <fcntl.h>
#include <poll.h>
#include <stdexcept>
#include <unistd.h>
#include <utility>

namespace e2e {

namespace {

void runTool(const std::string& folder, std::vector<std::string> command) {
    command.insert(command.begin(), builtProgram("zpctl"));
    Program tool({.command = command, .settings = {}, .errorFile = folder + "/zpctl.log"});
    if (tool.exitStatus() != 0)
        throw std::runtime_error("zpctl failed: " + tool.errors());
}

} // namespace

Signer::Signer(const Home& home, const std::string& name, bool trusted)
    : folder_(home / ("keys-" + name)), trustedKey_(home / ("etc/trust.d/" + name + ".pem")) {
    fs::create_directories(folder_);
    runTool(folder_, {"keygen", folder_});
    fs::create_directories(home / "etc/trust.d");
    if (trusted)
        fs::copy_file(folder_ + "/zephrin.pub.pem", trustedKey_);
}

void Signer::sign(const std::string& path, const Item& entitlements) const {
    const std::string file = folder_ + "/entitlements.plist";
    writeFile(file, xmlPlist(entitlements));
    runTool(folder_, {"sign", "--key", folder_ + "/zephrin.key.pem", "--entitlements", file, path});
}

Item Signer::manager() {
    return Item::map({{"com.tovana.private.zephrin.manager", true}});
}

Talk::Pipes Talk::makePipes() {
    Pipes pipes{};
    if (pipe2(pipes.commands, O_CLOEXEC) != 0 || pipe2(pipes.answers, O_CLOEXEC) != 0)
        throw std::runtime_error("no pipe");
    return pipes;
}

Talk::Talk(const Home& home, const std::vector<std::string>& command, std::optional<uid_t> user)
    : pipes_(makePipes()),
      program_({.command = command,
                .settings = {{"ZEPHRIN_HOME", home.path()}},
                .errorFile = home / "probe.log",
                .user = user,
                .inputFd = pipes_.commands[0],
                .outputFd = pipes_.answers[1]}) {
    close(pipes_.commands[0]);
    close(pipes_.answers[1]);
}

Talk::~Talk() {
    endInput();
    close(pipes_.answers[0]);
}

void Talk::endInput() {
    if (pipes_.commands[1] >= 0)
        close(std::exchange(pipes_.commands[1], -1));
}

void Talk::tell(const std::string& line) const {
    const std::string bytes = line + "\n";
    if (write(pipes_.commands[1], bytes.data(), bytes.size()) < 0)
        throw std::runtime_error("the probe has ended");
}

std::string Talk::hear() {
    std::size_t end = 0;
    while ((end = heard_.find('\n')) == std::string::npos) {
        pollfd wait{.fd = pipes_.answers[0], .events = POLLIN, .revents = 0};
        char chunk[4096];
        if (poll(&wait, 1, 30'000) <= 0)
            throw std::runtime_error("the probe says nothing");
        const ssize_t got = read(pipes_.answers[0], chunk, sizeof chunk);
        if (got <= 0)
            return std::exchange(heard_, "");
        heard_.append(chunk, static_cast<std::size_t>(got));
    }
    std::string line = heard_.substr(0, end);
    heard_.erase(0, end + 1);
    return line;
}

std::string Talk::ask(const std::string& line) {
    tell(line);
    return hear();
}

std::vector<std::string> Talk::rest() {
    endInput();
    std::vector<std::string> lines;
    for (std::string line = hear(); !line.empty(); line = hear())
        lines.push_back(line);
    return lines;
}

std::string addProgram(const std::string& path, const char* name) {
    fs::create_directories(fs::path(path).parent_path());
    fs::copy_file(builtProgram(name), path, fs::copy_options::overwrite_existing);
    return path;
}

ManagerTest::Words ManagerTest::command(const std::string& program, const Words& steps) const {
    Words result = {program, daemon->socketPath()};
    result.insert(result.end(), steps.begin(), steps.end());
    return result;
}

std::string ManagerTest::remove(const Words& paths) const {
    std::string words = "remove";
    for (const std::string& path : paths)
        words += " " + path;
    return answerTo(manager, {"hello", words});
}

} // namespace e2e
