#pragma once

#include <atomic>
#include <concepts>
#include <expected>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/ipc/Listener.h"
#include "platform/ipc/Loop.h"
#include "platform/queue/SerialQueue.h"
#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "zpd/Platform.h"
#include "zpd/ZPDHolds.h"
#include "zpd/ZPDPlugInHold.h"
#include "zpd/ZPDPreparations.h"
#include "zpd/ZPDTerminations.h"
#include "zpd/ZPDUserPrefs.h"
#include "zpd/ZPDatabase.h"

class ZPDIpcClient;

// The daemon's one server: the plug-in database, extended by the service that clients talk to. It
// owns the listener, the queues, the holds and the preferences, and is its own database delegate.
//
//   "ipc"         the loop (a thread of its own) of the listener and all connections; it makes
//                 clients and transactions and never waits
//   "service"     every request of every client, one at a time, in the order of arrival
//   "registration"  what "add" and "remove" take long for, and where listed paths lead; of the rank
//                 of "service", and neither waits for the other
//   "serverSync"  a leaf: every access to the holds, always entered synchronously
//   "killer", "killer-waiter"  the answers to forced terminations, and what waits for them
//
// Made and destroyed on the main thread. The platform's services outlive it; it outlives its
// clients, whose connections end with the loop.
class ZPDServer : public ZPDatabase, private ZPDatabaseDelegate {
public:
    struct Settings {
        std::string socketPath;
        std::optional<std::string> databasePath; // nothing: where the annotations usually are
    };

    // Binds the service's socket but accepts nobody yet. Fails when the name is taken or the
    // socket cannot be made.
    [[nodiscard]] static std::expected<std::unique_ptr<ZPDServer>, platform::Error>
    create(const Platform& platform, const Settings& settings);
    ~ZPDServer() override;

    // The one server of this process, for code that has none at hand.
    // REQUIRES: it exists
    [[nodiscard]] static ZPDServer& server();

    [[nodiscard]] const Platform& services() const { return platformServices(); }

    [[nodiscard]] ZPDUserPrefs& userPrefs() { return userPrefs_; }

    // How often -v was given; kept, and without further effect.
    [[nodiscard]] unsigned verbose() const { return verbose_; }

    void setVerbose(unsigned verbose) { verbose_ = verbose; }

    // Begins to accept clients.
    void resume();
    // Accepts no more clients, releases all holds and waits for what is being saved. From then on
    // nothing is saved, and no request that would need it is answered. REQUIRES: no queue is held
    void stop();

    // ---- Requests (ZPDServerWork.cpp)

    // Runs a block on the service queue's own thread, after all that came before, and then
    // `afterwards`, once the queue was let go. Any thread.
    void submitWork(platform::SerialQueue::Block block,
                    platform::SerialQueue::Block afterwards = {});

    // Runs a brief block at once, holding the service queue, when that is idle and the caller is
    // the IPC loop. Tells whether it did.
    template <std::invocable F>
    [[nodiscard]] bool tryWork(F&& block) {
        return ipcLoop_.isCurrent() && mainQueue_.tryRun(std::forward<F>(block));
    }

    // Requests of clients of whom it is not known yet what they may do. Any thread.
    [[nodiscard]] ZPDPreparations& preparations() { return preparations_; }

    void assertOnServiceQueue() const { mainQueue_.assertOnQueue(); }

    // Where requests that go through paths go on after they left the service queue. Any thread.
    [[nodiscard]] platform::SerialQueue& registrationQueue() { return registrationQueue_; }

    // ---- Holds (ZPDServerHolds.cpp). Any thread.

    // A client has at most so many holds, and so have all clients of a user together.
    static constexpr std::size_t mostHolds = 1'024;
    static constexpr std::size_t mostHoldsOfUser = 8'192;

    [[nodiscard]] bool holdOnPlugIn(const ZPDPlugIn& plugIn);
    // Fails when its client has too many, or has gone.
    [[nodiscard]] std::optional<platform::Error> addHold(const ZPDPlugInHold::Ptr& hold);
    // Releases the hold with this token; an unknown one does nothing.
    void unholdToken(const platform::Uuid& token);
    // Releases every hold that this client placed.
    void unholdClient(const ZPDIpcClient& client);

    // Ends the running processes of these plug-ins, and then, on "killer-waiter", completes. Any
    // thread.
    void terminatePlugIns(const std::vector<ARZephrinProxy::Ptr>& plugIns,
                          ZPDTerminations::Completion completion) {
        terminations_.terminate(plugIns, std::move(completion));
    }

private:
    ZPDServer(const Platform& platform, const Settings& settings);

    [[nodiscard]] std::optional<platform::Error> listen(const std::string& socketPath);
    void handle(platform::ipc::ListenerEvent event);
    void adopt(const std::shared_ptr<platform::ipc::Connection>& connection);

    void removedPlugIns(const std::vector<ARZephrinProxy::Ptr>& plugIns) override;
    // REQUIRES: on "serverSync"
    [[nodiscard]] std::optional<platform::Error> objectionTo(const ZPDPlugInHold& hold) const;
    void releaseAllHolds();

    static ZPDServer* theServer;

    unsigned verbose_ = 0;
    ZPDUserPrefs userPrefs_;
    ZPDHolds holds_;                     // only on "serverSync"
    std::atomic<bool> holdsAny_ = false; // whether there is one; changed there, read anywhere
    ZPDTerminations terminations_;
    ZPDPreparations preparations_;
    platform::SerialQueue syncQueue_;
    platform::ipc::Loop ipcLoop_;
    platform::SerialQueue registrationQueue_; // the next one hands on to it
    platform::SerialQueue mainQueue_;
    std::unique_ptr<platform::ipc::Listener> service_;
};
