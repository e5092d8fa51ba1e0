#pragma once

#include <expected>

#include "platform/file/File.h"

// A plug-in's end of the socket to the host that started it. No state; owned by nobody.
class ZPPlugInSocket {
public:
    // Its number, in decimal: how the job manager hands it to the process.
    static constexpr const char* variable = "ZEPHRIN_SOCKET";

    // A connected stream socket (AF_UNIX, blocking), close-on-exec from now on. The variable is
    // taken out of the environment, whatever the outcome: so what this process starts does not
    // think that it has a host, and a second call finds nothing. The stream ends when the host has
    // let go of its end.
    //
    // An errno value: ENOENT when this process was not started by the job manager, or has taken it
    // before; EBADF when the variable names no open descriptor; ENOTSOCK when that is no such
    // socket. Early in main, before there are threads: it changes the environment.
    [[nodiscard]] static std::expected<platform::UniqueFd, int> take();
};
