#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>

#include "Zephrin/ZPBundle.h"
#include "platform/ipc/Message.h"
#include "platform/ipc/Peer.h"
#include "platform/value/Value.h"
#include "zpd/ZPDEntitlementHolder.h"

namespace platform {
class SigningTask;
}

class Transaction;
class ZPDServer;

// One connected client: who it is, and what its connection brings.
//
// Made by the server on the IPC loop when a connection arrives; owned by the connection's event
// handler, so that it lives as long as the connection, and by requests that are under way. The
// server outlives it. Events arrive on the IPC loop, or on the service queue when a request that
// was done lets the next one in; they only make transactions. What belongs to the request under
// way is touched on the service queue alone.
class ZPDIpcClient final : public ZPDEntitlementHolder,
                           public std::enable_shared_from_this<ZPDIpcClient> {
public:
    // Learns who is there, takes the connection over and begins to serve it.
    static std::shared_ptr<ZPDIpcClient>
    create(const std::shared_ptr<platform::ipc::Connection>& connection, ZPDServer& server);
    ~ZPDIpcClient() override;

    // Empty once the connection is gone.
    [[nodiscard]] std::shared_ptr<platform::ipc::Connection> connection() const;

    [[nodiscard]] ZPDServer& server() const { return server_; }

    // Who connected; stays when the connection is gone.
    [[nodiscard]] const std::shared_ptr<const platform::ipc::Peer>& peer() const { return peer_; }

    // 0 once the connection is gone.
    [[nodiscard]] pid_t pid() const { return pid_; }

    // Where the client's program lies; empty when that cannot be told.
    [[nodiscard]] const std::string& path() const { return path_; }

    // The client's own bundle; nothing when its path cannot be told, an invalid one when others
    // could have written it.
    [[nodiscard]] const std::optional<ZPBundle>& bundle() const { return bundle_; }

    // Whether its requests are still carried out: until the connection is dead.
    [[nodiscard]] bool acceptWork() const { return acceptWork_; }

    // How many requests were taken up. REQUIRES: on the service queue
    [[nodiscard]] std::uint32_t requestCount() const { return requestCount_; }

    // A failed query counts as absent, and so does every entitlement while the request under way
    // is not proven to come from the program that connected. The first question of a request looks
    // whether what is known of the program still holds.
    // REQUIRES: on the service queue
    [[nodiscard]] std::optional<platform::Value>
    entitlementValueForKey(std::string_view key) override;
    [[nodiscard]] bool hasEntitlement(std::string_view key) override;

    // Carries out a part of a request that came back to the service queue: entitlements are those
    // of whoever sent it. REQUIRES: on the service queue
    void attend(const Transaction& transaction, const std::function<void()>& part);

    // False once the connection is gone; then it soon takes its holds along. Any thread.
    [[nodiscard]] bool isConnected() const;

    [[nodiscard]] std::string description() const;

private:
    ZPDIpcClient(const std::shared_ptr<platform::ipc::Connection>& connection, ZPDServer& server);
    void learnPath();
    void resume();

    void handle(platform::ipc::Event&& event);
    void handleRequest(platform::ipc::Message&& message);
    void prepare(std::shared_ptr<Transaction> transaction);
    void prepared(std::shared_ptr<Transaction> transaction);
    void submit(std::shared_ptr<Transaction> transaction);
    // REQUIRES: on the service queue
    void carryOut(Transaction& transaction);
    // REQUIRES: on the service queue
    [[nodiscard]] bool isStillItself();
    void dying();
    void dead();

    const std::weak_ptr<platform::ipc::Connection> connection_;
    ZPDServer& server_;
    const std::shared_ptr<const platform::ipc::Peer> peer_;
    std::atomic<pid_t> pid_;
    std::string path_;
    std::optional<ZPBundle> bundle_;
    std::unique_ptr<platform::SigningTask> task_;
    std::atomic<bool> acceptWork_ = true;

    // Of the request that is prepared; one at a time. Whoever comes second, the one who asked or
    // the answer, takes the request on.
    enum class Preparation : std::uint8_t { asked, awaited, known };
    std::atomic<Preparation> preparation_ = Preparation::asked;

    // Only on the service queue.
    std::uint32_t requestCount_ = 0;
    // Of the request under way.
    bool vouched_ = false; // it comes from the program itself
    bool rechecked_ = false;
    std::optional<bool> isStillItself_; // once that was asked
};

[[nodiscard]] inline std::string describe(const ZPDIpcClient& client) {
    return client.description();
}
