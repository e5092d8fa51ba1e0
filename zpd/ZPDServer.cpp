#include "zpd/ZPDServer.h"

#include <cassert>
#include <utility>
#include <variant>

#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Connection.h"
#include "platform/jobs/Jobs.h"
#include "zpd/ZPDIpcClient.h"

using platform::Error;
using platform::Value;
using platform::ipc::Connection;
using platform::ipc::ConnectionError;
using platform::ipc::Listener;
using platform::ipc::ListenerEvent;

ZPDServer* ZPDServer::theServer = nullptr;

ZPDServer::ZPDServer(const Platform& platform, const Settings& settings)
    : ZPDatabase(platform, settings.databasePath),
      userPrefs_(platform.preferences),
      terminations_(platform.jobs),
      syncQueue_("serverSync", platform::QueueRank::leaf),
      ipcLoop_("ipc"),
      registrationQueue_("registration", platform::QueueRank::service),
      mainQueue_("service", platform::QueueRank::service) {
    theServer = this;
    setDelegate(this);
}

std::expected<std::unique_ptr<ZPDServer>, Error> ZPDServer::create(const Platform& platform,
                                                                   const Settings& settings) {
    std::unique_ptr<ZPDServer> server(new ZPDServer(platform, settings));
    if (auto error = server->listen(settings.socketPath))
        return std::unexpected(std::move(*error));
    return server;
}

ZPDServer::~ZPDServer() {
    service_.reset();
    ipcLoop_.stop(); // from here on no client calls in
    preparations_.close();
    mainQueue_.sync([] {});
    registrationQueue_.sync([] {});
    mainQueue_.sync([] {}); // what came back from there
    setDelegate(nullptr);
    terminations_.close();
    closeAnnotations(); // the last requests are answered while the loop is still there
    theServer = nullptr;
}

ZPDServer& ZPDServer::server() {
    assert(theServer);
    return *theServer;
}

std::optional<Error> ZPDServer::listen(const std::string& socketPath) {
    auto listener = Listener::create(ipcLoop_, socketPath,
                                     [this](ListenerEvent event) { handle(std::move(event)); });
    if (!listener)
        return listener.error();
    service_ = std::move(*listener);
    return std::nullopt;
}

void ZPDServer::resume() {
    ipcLoop_.start();
    service_->resume();
}

void ZPDServer::stop() {
    service_->cancel();
    releaseAllHolds();
    closeAnnotations();
}

// Runs on the IPC loop.
void ZPDServer::handle(ListenerEvent event) {
    if (auto* const connection = std::get_if<std::shared_ptr<Connection>>(&event)) {
        adopt(*connection);
    } else if (const auto* const error = std::get_if<ConnectionError>(&event)) {
        if (*error == ConnectionError::invalid)
            ZPDLogOps().standard("potentially unexpected error from ipc: %{public}@", *error);
        else
            ZPDLogOps().error("unexpected error from ipc: %{public}@", *error);
    } else {
        ZPDLogOps().error("unexpected message: %{public}@", std::get<Value>(event));
    }
}

// Runs on the IPC loop. A connection that nobody keeps is closed.
void ZPDServer::adopt(const std::shared_ptr<Connection>& connection) {
    if (services().jobs.isShutOut(*connection->peer())) {
        ZPDLogOps().error("process %d is a plug-in's: its connection is closed", connection->pid());
        return;
    }
    ZPDIpcClient::create(connection, *this);
}

// Runs on the registry's queue.
void ZPDServer::removedPlugIns(const std::vector<ARZephrinProxy::Ptr>& plugIns) {
    terminatePlugIns(plugIns, [plugIns] {
        if (ZPDLogOps().enabled(platform::log::Level::debug))
            ZPDLogOps().debug("removal complete for %@", describeAll(plugIns));
    });
}
