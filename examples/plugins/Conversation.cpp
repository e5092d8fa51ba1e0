#include "examples/plugins/Conversation.h"

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <optional>
#include <unistd.h>

namespace example {

namespace {

constexpr std::size_t longestLine = 64 * 1024;

struct Ends {
    int in = STDIN_FILENO;
    int out = STDOUT_FILENO;
};

Ends endsOfTalk() {
    const char* named = std::getenv("ZEPHRIN_SOCKET");
    if (!named || !*named)
        return {};
    const int socket = std::atoi(named);
    return {socket, socket};
}

bool writeAll(int fd, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = write(fd, text.data(), text.size());
        if (written < 0 && errno == EINTR)
            continue;
        if (written <= 0)
            return false;
        text.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
}

// Appends what the host has sent; false when it hung up.
bool readMore(int fd, std::string& received) {
    char part[4096];
    ssize_t size = 0;
    do
        size = read(fd, part, sizeof part);
    while (size < 0 && errno == EINTR);
    if (size <= 0)
        return false;
    received.append(part, static_cast<std::size_t>(size));
    return true;
}

std::optional<std::string> takeLine(std::string& received) {
    const std::size_t end = received.find('\n');
    if (end == std::string::npos)
        return std::nullopt;
    std::string line = received.substr(0, end);
    received.erase(0, end + 1);
    return line;
}

} // namespace

int converse(const Answer& answer) {
    const Ends ends = endsOfTalk();
    std::string received;
    while (readMore(ends.in, received)) {
        while (const auto line = takeLine(received)) {
            if (!writeAll(ends.out, answer(*line) + '\n'))
                return EXIT_FAILURE;
        }
        if (received.size() > longestLine)
            return EXIT_FAILURE;
    }
    return EXIT_SUCCESS;
}

} // namespace example
