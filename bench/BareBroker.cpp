#include "bench/BareBroker.h"

#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace bench {

namespace {

sockaddr_un addressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    return address;
}

int newSocket() {
    const int made = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (made < 0)
        throw std::runtime_error("socket failed");
    return made;
}

int listenAt(const std::string& path) {
    const int listener = newSocket();
    const sockaddr_un address = addressOf(path);
    if (bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        listen(listener, SOMAXCONN) != 0)
        throw std::runtime_error("cannot listen at " + path);
    return listener;
}

// A message of these bytes, with room for one descriptor.
struct OneDescriptor {
    OneDescriptor(char* bytes, std::size_t size) : part{bytes, size} {
        message.msg_iov = &part;
        message.msg_iovlen = 1;
        message.msg_control = room;
        message.msg_controllen = sizeof room;
    }

    void pass(int descriptor) {
        cmsghdr* const header = CMSG_FIRSTHDR(&message);
        header->cmsg_level = SOL_SOCKET;
        header->cmsg_type = SCM_RIGHTS;
        header->cmsg_len = CMSG_LEN(sizeof descriptor);
        std::memcpy(CMSG_DATA(header), &descriptor, sizeof descriptor);
    }

    [[nodiscard]] int passed() {
        const cmsghdr* const header = CMSG_FIRSTHDR(&message);
        int descriptor = -1;
        if (header)
            std::memcpy(&descriptor, CMSG_DATA(header), sizeof descriptor);
        return descriptor;
    }

    alignas(cmsghdr) char room[CMSG_SPACE(sizeof(int))] = {};
    iovec part;
    msghdr message{};
};

void serve(int listener, const std::string& path, const BareBroker::Sizes& sizes) {
    std::vector<char> request(sizes.request);
    std::vector<char> reply(sizes.reply, 'x');
    for (;;) {
        const int client = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (recv(client, request.data(), request.size(), MSG_WAITALL) > 0) {
            const int opened = open(path.c_str(), O_RDONLY | O_CLOEXEC);
            OneDescriptor answer(reply.data(), reply.size());
            answer.pass(opened);
            (void)sendmsg(client, &answer.message, MSG_NOSIGNAL);
            close(opened);
        }
        close(client);
    }
}

} // namespace

BareBroker::BareBroker(const std::string& folder, const std::string& path, const Sizes& sizes)
    : socketPath_(folder + "/bare"), sizes_(sizes) {
    const int listener = listenAt(socketPath_);
    pid_ = fork();
    if (pid_ < 0)
        throw std::runtime_error("fork failed");
    if (pid_ == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        serve(listener, path, sizes);
    }
    close(listener);
}

BareBroker::~BareBroker() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
    unlink(socketPath_.c_str());
}

void BareBroker::ask() const {
    const int broker = newSocket();
    const sockaddr_un address = addressOf(socketPath_);
    std::vector<char> bytes(std::max(sizes_.request, sizes_.reply), 'x');
    OneDescriptor answer(bytes.data(), sizes_.reply);
    const bool asked =
        connect(broker, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 &&
        send(broker, bytes.data(), sizes_.request, MSG_NOSIGNAL) > 0 &&
        recvmsg(broker, &answer.message, MSG_CMSG_CLOEXEC | MSG_WAITALL) > 0;
    const int opened = asked ? answer.passed() : -1;
    close(broker);
    if (opened < 0)
        throw std::runtime_error("the bare broker gave nothing");
    close(opened);
}

} // namespace bench
