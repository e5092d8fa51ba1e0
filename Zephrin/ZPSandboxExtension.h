#pragma once

#include <cstdint>
#include <expected>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

#include "platform/file/File.h"

namespace platform {
class SandboxExtensions;
}

// A permission that the daemon gave this process as a token, from the "extensions" of a form or of
// the reply to "access": to read a file, or a folder and what lies below it, of a plug-in's bundle.
// Consumed, it is an open descriptor, its handle.
//
// Owned by whoever has the token. One owner consumes, opens, expels and lets go, on one thread at a
// time; the token and the handle may be looked at from any thread. `consume` and `open` ask the
// daemon and wait for it, up to 10 seconds when it hangs; no other call waits.
class ZPSandboxExtension {
public:
    static constexpr std::int64_t notConsumed = -1;

    // Uses the daemon that this process would talk to.
    explicit ZPSandboxExtension(std::string token);
    ZPSandboxExtension(std::string token, std::shared_ptr<platform::SandboxExtensions> sandbox);
    ZPSandboxExtension(const ZPSandboxExtension&) = delete;
    ZPSandboxExtension& operator=(const ZPSandboxExtension&) = delete;
    ~ZPSandboxExtension(); // expels

    [[nodiscard]] std::string token() const;
    void setToken(std::string token);

    // -1 while it is not consumed. Otherwise a descriptor of this object's, open to read: of the
    // file, or of the folder. (In a process that sees other files than the daemon, for instance
    // from within a container, the descriptor of a folder leads nowhere; `open` works all the
    // same.)
    [[nodiscard]] std::int64_t handle() const;
    void setHandle(std::int64_t handle);

    // Activates the permission. Does nothing when that was done; a failure is logged, and the
    // handle stays -1.
    void consume();
    // Gives the permission up. Does nothing when there is none.
    void expel();

    // A file or folder below the folder, by its relative path without "..": a confined process
    // cannot open it by itself. The descriptor outlives this object. On failure an errno value:
    // EBADF when this was not consumed, EACCES for a token that does not count (any more, as after
    // a restart of the daemon), ENOENT, ENOTDIR, ELOOP (there is a symbolic link on the way),
    // EINVAL for a path that does not lead down, ECONNREFUSED or ENOENT without a daemon,
    // ETIMEDOUT.
    [[nodiscard]] std::expected<platform::UniqueFd, int> open(std::string_view path) const;

    // Whether both have the same token, consumed or not.
    [[nodiscard]] bool isEqual(const ZPSandboxExtension& other) const;

private:
    const std::shared_ptr<platform::SandboxExtensions> sandbox_;
    mutable std::mutex mutex_;
    std::string token_;                 // guarded
    std::int64_t handle_ = notConsumed; // guarded
};
