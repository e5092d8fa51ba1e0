#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <fcntl.h>
#include <iostream>
#include <langinfo.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/log/Log.h"
#include "zpctl/CommandLine.h"

namespace {

bool wantsColour() {
    const char* refusal = std::getenv("NO_COLOR"); // set and not empty: no colours
    const char* terminal = std::getenv("TERM");
    if (refusal && *refusal)
        return false;
    return isatty(STDOUT_FILENO) && terminal && std::strcmp(terminal, "dumb") != 0;
}

// A person reads standard error: the library's log lines only come when they were asked for.
void configureLog() {
    if (std::getenv("ZEPHRIN_LOG"))
        platform::log::configureFromEnvironment();
    else
        platform::log::silence();
}

// Whoever starts zpctl with one of the standard descriptors closed must not get a socket there.
// What stands in for it fails like a closed one: each is open the wrong way round.
void fillStandardDescriptors() {
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        if (::fcntl(fd, F_GETFD) < 0)
            (void)::open("/dev/null", fd == STDIN_FILENO ? O_WRONLY : O_RDONLY);
    }
}

} // namespace

int main(int argc, char** argv) {
    fillStandardDescriptors();
    std::setlocale(LC_CTYPE, "");
    configureLog();
    const zpctl::Terminal terminal{.out = std::cout,
                                   .err = std::cerr,
                                   .inColour = wantsColour(),
                                   .inUtf8 = std::strcmp(nl_langinfo(CODESET), "UTF-8") == 0,
                                   .descriptor = STDOUT_FILENO};
    try {
        const std::vector<std::string> arguments(argv + 1, argv + argc);
        const zpctl::Status status = zpctl::run(arguments, terminal);
        if (!std::cout.flush() && !terminal.readerIsGone()) {
            std::perror("zpctl: standard output");
            return EXIT_FAILURE;
        }
        return static_cast<int>(status);
    } catch (const std::exception& failure) {
        std::cerr << "zpctl: " << failure.what() << '\n';
        return EXIT_FAILURE;
    }
}
