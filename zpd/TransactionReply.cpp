// How a transaction ends. On the service queue, or wherever a handler finishes its work; the reply
// of a request that changed annotations goes out from the queue "annotations".

#include "Zephrin/ZPDError.h"
#include "platform/ipc/Connection.h"
#include "platform/probe/Probes.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

void Transaction::setMatches(std::optional<platform::Value> matches) {
    static const platform::SharedBytes key(std::string_view("matches"));
    if (matches)
        reply().set(key, std::move(*matches));
}

// The reply is copied, since a handler that reports more than once goes on with it. A later one
// never overtakes one that waits.
void Transaction::done() {
    const std::uint64_t changes = server().annotationChanges();
    const bool mayNeedSaving = annotates_ || changes != changesBefore_;
    if (!mayNeedSaving || (!replyWaited_ && server().areAnnotationsSaved(changes)))
        return send(reply_);
    replyWaited_ = true;
    server().whenAnnotationsSaved(
        changes, [self = shared_from_this(), reply = reply_] { self->send(reply); });
}

void Transaction::send(const platform::ipc::Reply& reply) {
    if (platform::probe::requestOutputEnabled())
        platform::probe::requestOutput(client().pid(), platform::describe(reply.body).c_str());
    if (connection_)
        connection_->send(reply);
}

void Transaction::fail(std::uint64_t code, std::string_view message) {
    reply().set("errorcode", code);
    reply().set("error", message);
    done();
}

void Transaction::fail(std::uint64_t code, const platform::Error& error) {
    const bool isOurs = error.domain == &ZPDErrorDomain;
    const std::string message = error.description ? *error.description : describe(error);
    fail(isOurs ? static_cast<std::uint64_t>(error.code) : code, message);
}
