#include "zpd/ZPDIpcClient.h"

#include <utility>

#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Connection.h"
#include "platform/ipc/Peer.h"
#include "platform/log/Render.h"
#include "platform/probe/Probes.h"
#include "platform/process/Processes.h"
#include "platform/signing/CodeSigning.h"
#include "zpd/ZPDServer.h"

using platform::Value;
using platform::ipc::Connection;

namespace {

constexpr std::size_t pathRoom = 2048; // bytes, the closing NUL included

} // namespace

std::shared_ptr<ZPDIpcClient> ZPDIpcClient::create(const std::shared_ptr<Connection>& connection,
                                                   ZPDServer& server) {
    std::shared_ptr<ZPDIpcClient> client(new ZPDIpcClient(connection, server));
    client->resume();
    return client;
}

ZPDIpcClient::ZPDIpcClient(const std::shared_ptr<Connection>& connection, ZPDServer& server)
    : connection_(connection), server_(server), peer_(connection->peer()), pid_(peer_->pid) {
    learnPath();
    ZPDLogOps().debug("new client %d %s", pid(), path_);
    platform::probe::clientNew(pid());
    task_ = server_.services().signing.taskFor(peer_);
}

ZPDIpcClient::~ZPDIpcClient() = default;

// The loop must not read what a client laid out for it, in folder after folder: a program that its
// user could change has no bundle. Nothing is lost, as plug-ins in such an application are never
// registered.
void ZPDIpcClient::learnPath() {
    auto path = server_.services().processes.executablePath(*peer_, pathRoom);
    if (!path)
        return;
    path_ = std::move(*path);
    bundle_ = ZPBundle::forTrustedExecutablePath(path_);
}

void ZPDIpcClient::resume() {
    const auto there = connection_.lock();
    there->setEventHandler([client = shared_from_this()](platform::ipc::Event&& event) {
        client->handle(std::move(event));
    });
    there->resume();
}

std::shared_ptr<Connection> ZPDIpcClient::connection() const {
    return acceptWork() ? connection_.lock() : nullptr;
}

bool ZPDIpcClient::isConnected() const {
    const auto there = connection();
    return there && there->isAlive();
}

std::optional<Value> ZPDIpcClient::entitlementValueForKey(std::string_view key) {
    server_.assertOnServiceQueue();
    if (!vouched_)
        return std::nullopt;
    if (!std::exchange(rechecked_, true))
        task_->recheck();
    auto value = task_->entitlement(key);
    if (!value) {
        ZPDLogOps().error("error retrieving entitlements for client %d", pid());
        return std::nullopt;
    }
    return *value && isStillItself() ? std::move(*value) : std::nullopt;
}

// What its process wrote counts for the program only while it lives and has not become another:
// its pid tells who wrote, and is free for others once it has ended.
bool ZPDIpcClient::isStillItself() {
    if (!isStillItself_) {
        isStillItself_ = platform::ipc::runsItsExecutable(*peer_);
        if (!*isStillItself_)
            ZPDLogOps().info("client %d has ended or runs another program by now", pid());
    }
    return *isStillItself_;
}

bool ZPDIpcClient::hasEntitlement(std::string_view key) {
    const auto value = entitlementValueForKey(key);
    return value && !value->equalsFalse();
}

std::string ZPDIpcClient::description() const {
    const void* const self = this;
    const auto there = connection();
    if (!there)
        return platform::log::renderText("<ZPDIpcClient %p NO CONNECTION>", self);
    return platform::log::renderText("<ZPDIpcClient %p con=%@ pid=%d path=%@>", self, *there, pid(),
                                     path_);
}
