#include "tests/server/ClientFixture.h"

#include <chrono>
#include <thread>
#include <variant>

#include "platform/ipc/ClientConnection.h"
#include "platform/ipc/Connection.h"
#include "platform/ipc/Listener.h"
#include "platform/queue/SerialQueue.h"

using platform::ipc::Connection;
using platform::ipc::Listener;

ClientFixture::ClientFixture() : replyQueue_(std::make_shared<platform::SerialQueue>("replies")) {}

ClientFixture::~ClientFixture() {
    endClient();
}

void ClientFixture::endClient() {
    otherEnd_.reset();
    accepted_.reset();
    if (!hasServer())
        return;
    onServiceQueue([] {}); // no request is left that knows its connection
    listener_.reset();
    loop_.stop();
}

const std::shared_ptr<ZPDIpcClient>& ClientFixture::client() {
    if (accepted_)
        return accepted_;
    const Awaited<std::shared_ptr<ZPDIpcClient>> arrived;
    listener_ = Listener::create(loop_, folder_ / "own",
                                 [this, arrived](platform::ipc::ListenerEvent event) {
                                     if (auto* const peer =
                                             std::get_if<std::shared_ptr<Connection>>(&event))
                                         arrived.bring(ZPDIpcClient::create(*peer, server()));
                                 })
                    .value();
    server();
    loop_.start();
    listener_->resume();
    otherEnd_ = std::make_unique<platform::ipc::ClientConnection>(folder_ / "own", replyQueue_);
    otherEnd_->resume();
    (void)askThroughClient({});
    accepted_ = arrived.get();
    return accepted_;
}

void ClientFixture::disconnect() {
    otherEnd_.reset();
    while (accepted_->pid() != 0)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
}

std::shared_ptr<Transaction> ClientFixture::transaction(Dictionary request) {
    platform::ipc::Message message{.body = std::move(request), .expectsReply = false};
    return std::make_shared<Transaction>(std::move(message), client());
}

ClientFixture::Reply ClientFixture::askThroughClient(const Dictionary& request) {
    return beginToAskThroughClient(request).get();
}

Awaited<ClientFixture::Reply> ClientFixture::beginToAskThroughClient(const Dictionary& request) {
    const Awaited<Reply> arrived;
    otherEnd_->sendWithReply(request, [arrived](Reply reply) { arrived.bring(std::move(reply)); });
    return arrived;
}

void ClientFixture::onServiceQueue(platform::SerialQueue::Block block) {
    const Awaited<bool> done;
    server().submitWork([&block, done] {
        block();
        done.bring(true);
    });
    (void)done.get();
}
