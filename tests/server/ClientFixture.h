#pragma once

#include <memory>

#include "platform/ipc/Loop.h"
#include "tests/server/Awaited.h"
#include "tests/server/ServerFixture.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"

namespace platform::ipc {
class Listener;
}

// The server, and one of its client objects within the test's reach: its connection is accepted by
// a listener of the test's own.
class ClientFixture : public ServerFixture {
protected:
    ClientFixture();
    ~ClientFixture() override;

    // Connected with the first call.
    const std::shared_ptr<ZPDIpcClient>& client();
    // Lets everything of the client go; afterwards the server may stop.
    void endClient();
    // The other end goes away; returns when the client object knows.
    void disconnect();

    // A request of the client, not yet dispatched.
    [[nodiscard]] std::shared_ptr<Transaction> transaction(Dictionary request);
    [[nodiscard]] Reply askThroughClient(const Dictionary& request);
    [[nodiscard]] Awaited<Reply> beginToAskThroughClient(const Dictionary& request);
    // Runs a block on the service queue and waits for it.
    void onServiceQueue(platform::SerialQueue::Block block);

private:
    platform::ipc::Loop loop_{"test"};
    std::unique_ptr<platform::ipc::Listener> listener_;
    std::shared_ptr<platform::SerialQueue> replyQueue_;
    std::unique_ptr<platform::ipc::ClientConnection> otherEnd_;
    std::shared_ptr<ZPDIpcClient> accepted_;
};
