// What a client's connection brings. On the IPC loop, or on the service queue's thread for a
// request that waited for the one before it.

#include <utility>
#include <variant>

#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Connection.h"
#include "platform/probe/Probes.h"
#include "platform/signing/CodeSigning.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

using platform::Value;
using platform::ipc::ConnectionError;
using platform::ipc::Event;
using platform::ipc::Message;

namespace {

// A client that sends one brief request after the other goes on upon the loop, where all clients
// take turns, also when one of them had to wait for the queue's own thread.
void letNextIn(Transaction& transaction, bool wasBrief) {
    if (transaction.isLeftOpen())
        return;
    if (wasBrief)
        transaction.takenOnLoop();
    else
        transaction.taken();
}

} // namespace

void ZPDIpcClient::handle(Event&& event) {
    if (auto* const message = std::get_if<Message>(&event))
        return handleRequest(std::move(*message));
    if (const auto* const value = std::get_if<Value>(&event))
        return ZPDLogOps().error("unexpected message: %{public}@ from: %d", *value, pid());
    switch (const auto error = std::get<ConnectionError>(event)) {
    case ConnectionError::terminationImminent:
        return dying();
    case ConnectionError::invalid:
        return dead();
    default:
        ZPDLogOps().error("unexpected error type from ipc: %{public}@", error);
    }
}

void ZPDIpcClient::handleRequest(Message&& message) {
    auto transaction = std::make_shared<Transaction>(std::move(message), shared_from_this());
    if (platform::probe::requestInputEnabled())
        platform::probe::requestInput(pid(), platform::describe(transaction->request()).c_str());
    if (transaction->isVouchedFor())
        prepare(std::move(transaction));
    else
        submit(std::move(transaction));
}

// What the program may do must be known before its request is carried out. It is already, as a
// rule; else the request waits, and with it all that this client sends after it.
void ZPDIpcClient::prepare(std::shared_ptr<Transaction> transaction) {
    if (!server_.preparations().begin())
        return;
    preparation_ = Preparation::asked;
    task_->prepare([transaction]() mutable {
        ZPDServer& server = transaction->server();
        transaction->client().prepared(std::move(transaction));
        server.preparations().end();
    });
    if (preparation_.exchange(Preparation::awaited) == Preparation::known)
        submit(std::move(transaction));
}

// Runs within `prepare`, or later on the signing service's thread.
void ZPDIpcClient::prepared(std::shared_ptr<Transaction> transaction) {
    if (preparation_.exchange(Preparation::known) == Preparation::awaited)
        submit(std::move(transaction));
}

void ZPDIpcClient::submit(std::shared_ptr<Transaction> transaction) {
    const bool brief = transaction->isBrief();
    if (brief && server_.tryWork([&] { carryOut(*transaction); }))
        return letNextIn(*transaction, false);
    server_.submitWork([transaction] { transaction->client().carryOut(*transaction); },
                       [transaction, brief] { letNextIn(*transaction, brief); });
}

void ZPDIpcClient::carryOut(Transaction& transaction) {
    constexpr std::uint32_t countedEvery = 1000;
    server_.assertOnServiceQueue();
    if (++requestCount_ % countedEvery == 0)
        ZPDLogOps().debug("client %d used %u requests so far", pid(), requestCount_);
    attend(transaction, [&] { transaction.dispatch(); });
}

void ZPDIpcClient::attend(const Transaction& transaction, const std::function<void()>& part) {
    server_.assertOnServiceQueue();
    vouched_ = transaction.isVouchedFor();
    rechecked_ = false;
    isStillItself_.reset();
    part();
    vouched_ = false;
}

void ZPDIpcClient::dying() {
    ZPDLogOps().debug("client %d termination imminent", pid());
}

void ZPDIpcClient::dead() {
    server_.unholdClient(*this);
    ZPDLogOps().debug("client %d is dead", pid());
    acceptWork_ = false;
    platform::probe::clientDone(pid());
    pid_ = 0;
}
