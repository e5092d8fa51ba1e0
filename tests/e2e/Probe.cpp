// probe SOCKET [COMMAND...]: a client that speaks the wire by itself and shows what it may do.
// Without commands it takes them from standard input, one a line. Each answers with one line; that
// of a request for all plug-ins is "granted", or the code and text of the refusal.

#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <functional>
#include <iostream>
#include <iterator>
#include <linux/sched.h>
#include <map>
#include <sched.h>
#include <sstream>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

Item allPlugIns() {
    return envelope("match", Item::map({{"flags", 0x200}}));
}

std::string frameOf(unsigned kind, const Item& body) {
    return Frame{.kind = kind, .id = 99, .body = encode(body)}.bytes();
}

std::string said(const Item& reply) {
    const std::string error = errorOf(reply);
    return error.empty() ? "granted" : error;
}

void say(const std::string& line) {
    std::cout << (line + "\n") << std::flush;
}

void require(bool worked, const char* what) {
    if (!worked)
        throw std::runtime_error(std::string(what) + ": " + std::strerror(errno));
}

// Writes bytes under the name of another process.
void sendAs(pid_t pid, int fd, std::string bytes) {
    alignas(cmsghdr) char control[CMSG_SPACE(sizeof(ucred))] = {};
    iovec part{bytes.data(), bytes.size()};
    msghdr message{};
    message.msg_iov = &part;
    message.msg_iovlen = 1;
    message.msg_control = control;
    message.msg_controllen = sizeof control;
    cmsghdr* const head = CMSG_FIRSTHDR(&message);
    head->cmsg_level = SOL_SOCKET;
    head->cmsg_type = SCM_CREDENTIALS;
    head->cmsg_len = CMSG_LEN(sizeof(ucred));
    const ucred writer{pid, geteuid(), getegid()};
    std::memcpy(CMSG_DATA(head), &writer, sizeof writer);
    require(sendmsg(fd, &message, MSG_NOSIGNAL) >= 0, "forging");
}

// A copy of this process that does one thing and ends; it has the socket too.
pid_t aside(const std::function<void()>& act) {
    const pid_t child = fork();
    require(child >= 0, "fork");
    if (child > 0)
        return child;
    try {
        act();
    } catch (const std::exception& error) {
        say(error.what());
    }
    _exit(0);
}

// The next process of this pid.
[[noreturn]] void becomePid(pid_t pid, const std::function<void()>& act) {
    while (kill(pid, 0) == 0)
        std::this_thread::sleep_for(1ms);
    clone_args arguments{};
    arguments.exit_signal = SIGCHLD;
    arguments.set_tid = reinterpret_cast<std::uintptr_t>(&pid);
    arguments.set_tid_size = 1;
    const long child = syscall(SYS_clone3, &arguments, sizeof arguments);
    require(child >= 0, "no pid of choice");
    if (child == 0)
        act();
    else
        waitpid(pid, nullptr, 0);
    _exit(0);
}

// Separated by spaces; the first also by a colon, for a command that is one argument.
std::vector<std::string> wordsOf(std::string line) {
    const auto mark = line.find_first_of(": ");
    if (mark != std::string::npos)
        line[mark] = ' ';
    std::istringstream text(line);
    return {std::istream_iterator<std::string>(text), {}};
}

class Probe {
public:
    explicit Probe(std::string socketPath) : socketPath_(std::move(socketPath)) {}

    void run(const std::string& line);

private:
    using Words = std::vector<std::string>;

    WireClient& client() { return *client_; }

    void connect();

    std::string ask() { return said(client().request(allPlugIns())); }

    std::string reply();
    void exec(const Words& words);
    void execAside(const Words& words, bool half);
    void forge(const std::string& signedProgram);
    void askAfterOwnEnd(bool samePid);

    const std::string socketPath_;
    std::optional<WireClient> client_;
};

void Probe::connect() {
    client_.emplace(socketPath_, WireClient::Greeting::leave);
    fcntl(client().fd(), F_SETFD, 0); // stays open over exec
}

std::string Probe::reply() {
    const auto frame = client().receive();
    return frame ? said(decode(frame->body)) : "end";
}

// "take:FD" among the arguments tells the program the number of the socket.
void Probe::exec(const Words& words) {
    Words arguments(words.begin() + 1, words.end());
    for (std::string& each : arguments) {
        if (each == "take:FD")
            each = "take:" + std::to_string(client().fd());
    }
    std::vector<char*> pointers;
    for (std::string& each : arguments)
        pointers.push_back(each.data());
    pointers.push_back(nullptr);
    execv(pointers[0], pointers.data());
    require(false, "exec");
}

// Asks, and becomes another program, while a child answers the greeting in its place. With `half`,
// the child also completes what was begun.
void Probe::execAside(const Words& words, bool half) {
    const std::string request = frameOf(requestFrame, allPlugIns());
    const std::size_t sent = half ? request.size() / 2 : request.size();
    const pid_t self = getpid();
    connect();
    client().send(request.substr(0, sent));
    aside([&] {
        client().readGreeting();
        std::this_thread::sleep_for(2ms);
        client().send(request.substr(sent));
        client().answerGreeting();
        client().post(allPlugIns());
        say(reply());
        say(reply());
        kill(self, SIGKILL);
    });
    exec(words);
}

// From a user and pid namespace of its own: connects, becomes a signed program, and lets another
// process there sign with its pid.
void Probe::forge(const std::string& signedProgram) {
    const std::string uid = std::to_string(geteuid());
    const std::string gid = std::to_string(getegid());
    require(unshare(CLONE_NEWUSER | CLONE_NEWPID) == 0, "namespaces");
    std::ofstream("/proc/self/uid_map") << uid + " " + uid + " 1";
    std::ofstream("/proc/self/setgroups") << "deny";
    std::ofstream("/proc/self/gid_map") << gid + " " + gid + " 1";
    waitpid(aside([&] {
                connect();
                const pid_t self = getpid();
                aside([&] {
                    client().readGreeting();
                    sendAs(self, client().fd(), frameOf(greetingAnswerFrame, client().greeting()));
                    sendAs(self, client().fd(), frameOf(requestFrame, allPlugIns()));
                    say(reply());
                    kill(self, SIGKILL);
                });
                exec({"exec", signedProgram, "30"});
            }),
            nullptr, 0);
}

// Leaves the socket to a child, which goes on when this process has ended.
void Probe::askAfterOwnEnd(bool samePid) {
    const pid_t self = getpid();
    aside([&] {
        if (samePid)
            becomePid(self, [&] { say(ask()); });
        while (getppid() == self)
            std::this_thread::sleep_for(1ms);
        say(ask());
    });
    _exit(0);
}

void Probe::run(const std::string& line) {
    const Words words = wordsOf(line);
    const std::map<std::string, std::function<void()>> commands = {
        {"connect", [&] { connect(); }},
        {"listen", [&] { client().readGreeting(); }},
        {"greet", [&] { client().readGreeting(), client().answerGreeting(); }},
        {"hello", [&] { run("connect"), run("greet"); }},
        {"take", [&] { client_.emplace(std::stoi(words[1])); }},
        {"ask", [&] { say(ask()); }},
        {"names", [&] { say("plug-ins: " + matched(client(), Item())); }},
        {"paths",
         [&] {
             std::string paths;
             for (const Item& form : match(client(), Item(), std::stoul(words[1])))
                 paths += (paths.empty() ? "" : " ") + form["path"].text();
             say(paths);
         }},
        {"remove",
         [&] {
             const Words paths(words.begin() + 1, words.end());
             say(said(client().request(pathsRequest("remove", paths))));
         }},
        {"hold",
         [&] {
             const Item keys = Item::map({{"paths", Item::array({words[1]})}, {"flags", 1}});
             const Item reply = client().request(envelope("lock", keys));
             say(reply.has("uuids") ? "held" : said(reply));
         }},
        {"child-asks", [&] { waitpid(aside([&] { say(ask()); }), nullptr, 0); }},
        {"heir-asks", [&] { askAfterOwnEnd(false); }},
        {"namesake-asks", [&] { askAfterOwnEnd(true); }},
        {"exec", [&] { exec(words); }},
        {"exec-aside", [&] { execAside(words, false); }},
        {"exec-aside-half", [&] { execAside(words, true); }},
        {"forge", [&] { forge(words[1]); }},
        {"hide", [&] { prctl(PR_SET_DUMPABLE, 0); }},
        {"confine", [&] { require(unshare(CLONE_NEWNS) == 0, "unshare"); }}};
    commands.at(words.at(0))();
}

} // namespace
} // namespace e2e

int main(int count, char** arguments) {
    if (count < 2)
        return 2;
    try {
        e2e::Probe probe(arguments[1]);
        for (int i = 2; i < count; ++i)
            probe.run(arguments[i]);
        for (std::string line; count == 2 && std::getline(std::cin, line);)
            probe.run(line);
    } catch (const std::exception& error) {
        e2e::say(error.what());
        return 1;
    }
    return 0;
}
