#include "tests/support/ConfinementScene.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <cstring>
#include <filesystem>
#include <netinet/in.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/support/Files.h"

namespace fs = std::filesystem;

namespace {

// Everybody may read and write it, as far as its mode goes.
void writeOpenFile(const std::string& path, const std::string& content) {
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream(path) << content;
    setMode(path, 0666);
    setMode(fs::path(path).parent_path(), 0777);
}

template <class Address>
int boundSocket(int type, const Address& address, std::size_t size) {
    const int made =
        ::socket(reinterpret_cast<const sockaddr&>(address).sa_family, type | SOCK_CLOEXEC, 0);
    if (::bind(made, reinterpret_cast<const sockaddr*>(&address), static_cast<socklen_t>(size)) !=
        0)
        throw std::runtime_error("bind");
    if (type == SOCK_STREAM && ::listen(made, 16) != 0)
        throw std::runtime_error("listen");
    return made;
}

sockaddr_un unixAddress(const std::string& name) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    name.copy(address.sun_path, sizeof address.sun_path - 1);
    if (name[0] == '@')
        address.sun_path[0] = '\0';
    return address;
}

int boundUnix(const std::string& name, int type) {
    return boundSocket(type, unixAddress(name), offsetof(sockaddr_un, sun_path) + name.size());
}

int boundPort(int type, std::string& port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const int made = boundSocket(type, address, sizeof address);
    socklen_t size = sizeof address;
    ::getsockname(made, reinterpret_cast<sockaddr*>(&address), &size);
    port = std::to_string(ntohs(address.sin_port));
    return made;
}

pid_t sleepingChild() {
    const pid_t child = ::fork();
    if (child != 0)
        return child;
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    for (;;)
        ::pause();
}

} // namespace

ConfinementScene::ConfinementScene(Places places)
    : places_(std::move(places)),
      home_(places_.folder + "/home"),
      abstract_("@zephrin-test-" + std::to_string(::getpid()) + places_.folder) {
    writeOpenFile(home_ + "/secret", "secret");
    writeOpenFile(places_.folder + "/annotations/store", "store");
    writeOpenFile(places_.otherContainer + "/file", "theirs");
    writeOpenFile(places_.bundle + "/Resources/note", "resource");
    fs::copy_file(places_.bundle + "/probe", places_.container + "/program");
    listen();
    victim_ = sleepingChild();
}

ConfinementScene::~ConfinementScene() {
    ::kill(victim_, SIGKILL);
    ::waitpid(victim_, nullptr, 0);
    for (const int each : sockets_)
        ::close(each);
}

void ConfinementScene::listen() {
    sockets_.push_back(boundUnix(places_.folder + "/stream", SOCK_STREAM));
    sockets_.push_back(boundUnix(places_.folder + "/datagram", SOCK_DGRAM));
    sockets_.push_back(boundUnix(abstract_, SOCK_STREAM));
    sockets_.push_back(boundPort(SOCK_STREAM, tcpPort_));
    sockets_.push_back(boundPort(SOCK_DGRAM, udpPort_));
    for (const char* name : {"/stream", "/datagram"})
        setMode(places_.folder + name, 0777);
}

std::vector<Attempt> ConfinementScene::attempts() const {
    using enum Allowed;
    using enum Control;
    const std::string victim = std::to_string(victim_);
    const auto& [folder, bundle, container, otherContainer, library, sockets, files, hasSuid] =
        places_;
    std::vector<Attempt> all = {
        // its own
        {"read " + bundle + "/Resources/note", always, plugIn},
        {"run " + bundle + "/probe", always, plugIn},
        {"run /bin/true", always, plugIn},
        {"write " + container + "/file", always, plugIn},
        {"rewrite " + container + "/file", always, plugIn},
        {"folder " + container + "/folder", always, plugIn},
        {"rename " + container + "/file", always, plugIn},
        {"link " + container + "/link", always, plugIn},
        {"remove " + container + "/link", always, plugIn},
        {"read /proc/self/maps", always, plugIn},
        {"write /dev/null", always, plugIn},
        {"read /dev/urandom", always, plugIn},
        {"self", always, plugIn},
        {"run " + container + "/program", never, plugIn},
        {"tcp " + tcpPort_, withNetwork},
        {"udp " + udpPort_, withNetwork},
        {"read /etc/hosts", withNetwork},
        // other files
        {"read " + otherContainer + "/file"},
        {"write " + otherContainer + "/file"},
        {"read " + folder + "/annotations/store"},
        {"write " + folder + "/annotations/store"},
        {"read /etc/shadow", never, ::geteuid() == 0 ? daemon : nobody},
        {"read " + home_ + "/secret"},
        {"read " + home_},
        {"write " + home_ + "/new"},
        {"truncate " + home_ + "/secret"},
        {"empty " + home_ + "/secret"},
        {"rewrite " + home_ + "/secret"},
        {"mode " + home_ + "/secret"},
        {"folder " + home_ + "/folder"},
        {"rename " + home_ + "/secret"},
        {"write " + bundle + "/Resources/new"},
        {"write " + bundle + "/Resources/note"},
        {"truncate " + bundle + "/Resources/note"},
        {"empty " + bundle + "/Resources/note"},
        {"mode " + bundle + "/Resources/note"},
        {"remove " + bundle + "/Resources/note"},
        // other processes
        {"signal " + victim},
        {"limit " + victim},
        {"trace " + victim, never, nobody},
        {"memory " + victim, never, nobody},
        {"read /proc/" + victim + "/status"},
        {"session"},
        {"group"},
        {"survive"},
        {"owner"},
        // privileges, and the kernel's larger interfaces
        {"capabilities", never, ::geteuid() == 0 ? daemon : nobody},
        {"ring", never, nobody},
        {"namespace", never, nobody},
        {"keys", never, nobody},
        {"input", never, nobody},
        {"foreign", never, nobody},
        {"clone3", never, nobody},
        // unix sockets
        {"unix " + folder + "/stream"},
        {"unixDatagram " + folder + "/datagram"},
        {"unix " + abstract_},
    };
    for (const std::string& path : sockets)
        all.push_back({"unix " + path});
    for (const std::string& path : files)
        all.push_back({"read " + path});
    if (!library.empty())
        all.push_back({"load " + library, always, daemon});
    if (hasSuid)
        all.push_back({"gain " + bundle + "/suid", never, plugIn});
    return all;
}

void ConfinementScene::tidy() const {
    for (const char* made : {"/file", "/file-2", "/link", "/folder"})
        fs::remove(places_.container + made);
    for (const char* made : {"/new", "/folder", "/secret-2"})
        fs::remove(home_ + made);
    fs::remove(places_.bundle + "/Resources/new");
    writeOpenFile(home_ + "/secret", "secret");
    writeOpenFile(places_.bundle + "/Resources/note", "resource");
}

ProbeTalk::~ProbeTalk() {
    ::close(socket_);
}

int ProbeTalk::outcome(std::string_view line) const {
    const std::string text = std::string(line) + "\n";
    if (::send(socket_, text.data(), text.size(), MSG_NOSIGNAL) < 0)
        return -1;
    std::string answer;
    for (char letter = 0; ::recv(socket_, &letter, 1, 0) == 1 && letter != '\n';)
        answer += letter;
    return answer.empty() ? -1 : std::stoi(answer);
}

std::optional<std::string> objection(const Attempt& attempt, int outcome, bool confined,
                                     bool network) {
    const std::string text = attempt.line + ": " + std::to_string(outcome);
    const bool allowed = !confined || attempt.allowed == Allowed::always ||
                         (attempt.allowed == Allowed::withNetwork && network);
    if (allowed)
        return outcome == 0 ? std::nullopt : std::optional(text + ", but it should be allowed");
    // Refused, and not just in vain.
    constexpr int killed = 1000 + SIGSYS;
    for (const int refused : {EPERM, EACCES, ENOSYS, killed}) {
        if (outcome == refused)
            return std::nullopt;
    }
    return text + ", but it should be refused";
}
