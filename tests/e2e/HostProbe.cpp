// host_probe SERVICE [PID]: a host of plug-ins, through the client library. With a PID it goes on
// in a child that has this one. Takes commands from standard input, one a line, and answers each
// with one line:
//
//   ready UUID        "", or code and text of the refusal
//   start IDENTIFIER  what the plug-in says first, or code and text of the refusal
//   ask LINE          what the plug-in that was started last answers
//   pid               its process
//   list              "identifier profile pid hostPid" of each that runs

#include <csignal>
#include <cstdlib>
#include <future>
#include <iostream>
#include <linux/sched.h>
#include <string>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "Zephrin/ZPDaemonClient.h"
#include "Zephrin/ZPJobClient.h"

namespace {

using platform::Error;

std::string refusal(const Error& error) {
    return std::to_string(error.code) + " " + error.description.value_or("");
}

// Ends with the program; the last one is talked to.
std::vector<ZPStartedPlugIn> plugIns;

std::string hear() {
    std::string line;
    for (char c = 0; ::recv(plugIns.back().socket.get(), &c, 1, 0) == 1 && c != '\n';)
        line += c;
    return line;
}

std::string ask(const std::string& line) {
    const std::string text = line + "\n";
    (void)::send(plugIns.back().socket.get(), text.data(), text.size(), MSG_NOSIGNAL);
    return hear();
}

std::string ready(ZPDaemonClient& client, const std::string& uuid) {
    std::promise<std::string> answer;
    client.readyPlugIns({{"/", platform::Uuid::parse(uuid).value()}}, 0, std::nullopt,
                        [&](const ZPDaemonClient::Reply& reply) {
                            const auto error = ZPDaemonClient::errorInReply(reply);
                            answer.set_value(error ? refusal(*error) : "");
                        });
    return answer.get_future().get();
}

std::string start(ZPJobClient& jobs, const std::string& identifier) {
    std::promise<std::expected<ZPStartedPlugIn, Error>> answer;
    jobs.startPlugIn(identifier, [&](auto started) { answer.set_value(std::move(started)); });
    auto started = answer.get_future().get();
    if (!started)
        return refusal(started.error());
    plugIns.push_back(std::move(*started));
    return hear();
}

std::string list(ZPJobClient& jobs) {
    std::promise<std::string> answer;
    jobs.list([&](const auto& instances) {
        std::string line;
        for (const platform::Value& instance : *instances) {
            for (const char* key : {"identifier", "profile", "pid", "hostPid"})
                line += describe(*instance.dictionary()->find(key)) + " ";
        }
        answer.set_value(line);
    });
    return answer.get_future().get();
}

// The parent stays as it is, for whoever waits for it.
void goOnAs(pid_t pid) {
    clone_args arguments{};
    arguments.exit_signal = SIGCHLD;
    arguments.set_tid = reinterpret_cast<std::uint64_t>(&pid);
    arguments.set_tid_size = 1;
    const long child = ::syscall(SYS_clone3, &arguments, sizeof arguments);
    if (child < 0)
        std::cout << "cannot have this pid" << std::endl;
    if (child == 0)
        return;
    ::waitpid(static_cast<pid_t>(child), nullptr, 0);
    ::_exit(0);
}

} // namespace

int main(int count, char** arguments) {
    if (count > 2)
        goOnAs(std::atoi(arguments[2]));
    ZPDaemonClient client(arguments[1]);
    ZPJobClient jobs;
    for (std::string line; std::getline(std::cin, line);) {
        const auto space = std::min(line.find(' '), line.size());
        const std::string command = line.substr(0, space);
        const std::string argument = line.substr(std::min(space + 1, line.size()));
        std::cout << (command == "ready"   ? ready(client, argument)
                      : command == "start" ? start(jobs, argument)
                      : command == "ask"   ? ask(argument)
                      : command == "pid"   ? std::to_string(plugIns.back().pid)
                                           : list(jobs))
                  << std::endl;
    }
    return 0;
}
