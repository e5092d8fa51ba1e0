// How a transaction ends. On the service queue, or wherever a handler finishes its work.

#include "Zephrin/ZPDError.h"
#include "platform/ipc/Connection.h"
#include "platform/probe/Probes.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"

void Transaction::setMatches(std::optional<platform::Value> matches) {
    static const platform::SharedBytes key(std::string_view("matches"));
    if (matches)
        reply().set(key, std::move(*matches));
}

void Transaction::done() {
    if (platform::probe::requestOutputEnabled())
        platform::probe::requestOutput(client().pid(), platform::describe(reply_.body).c_str());
    if (connection_)
        connection_->send(reply_);
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
