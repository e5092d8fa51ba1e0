#pragma once

#include <expected>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "platform/ipc/Peer.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {

class HmacSandbox;
struct GrantedItem;

// The daemon's service for processes that hold a token: it opens what the token is for, or what
// lies below that, and hands the descriptor over. Only to read, only regular files and folders, and
// only within a registered bundle, however the token came about. docs/wire-format.md has the
// requests.
//
// Owned by the daemon's main; the sandbox and what the rules use must outlive it. Connections live
// on a loop of its own, "sandbox"; tokens are verified and files opened, which may wait for a disk,
// on its queue "broker", one request of a connection after another.
class SandboxBroker {
public:
    struct Rules {
        // Whether a canonical path is a registered bundle, or lies in one. Called on the queue.
        std::function<bool(const std::string& path)> isInRegisteredBundle;
        // Whether a process gets no connection at all; without it none is. Called on the loop.
        std::function<bool(const ipc::Peer& peer)> isShutOut;
    };

    // Binds the socket, but accepts nobody yet.
    [[nodiscard]] static std::expected<std::unique_ptr<SandboxBroker>, Error>
    create(const std::string& socketPath, const HmacSandbox& sandbox, Rules rules);
    SandboxBroker(const SandboxBroker&) = delete;
    SandboxBroker& operator=(const SandboxBroker&) = delete;
    ~SandboxBroker();

    void resume();
    // Takes no more connections, and the socket away.
    void stop();

private:
    struct Impl;
    explicit SandboxBroker(std::unique_ptr<Impl> impl);

    const std::unique_ptr<Impl> impl_;
};

} // namespace platform
