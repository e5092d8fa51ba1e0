#include "zpd/Transaction.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPDaemonClient.h"
#include "platform/probe/Probes.h"
#include "platform/types/Types.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

using platform::Value;

// What a request may be, in the order in which its type is compared.
struct Transaction::RequestType {
    std::string_view type;
    void (Transaction::*handler)();
};

const Transaction::RequestType Transaction::requestTypes[] = {
    {"add", &Transaction::addPlugIns},
    {"remove", &Transaction::removePlugIns},
    {"bulk", &Transaction::bulkPlugIns},
    {"match", &Transaction::matchPlugIns},
    {"ready", &Transaction::readyPlugIns},
    {"access", &Transaction::accessPlugIns},
    {"annotate", &Transaction::annotatePlugIns},
    {"bulk-annotate", &Transaction::bulkAnnotatePlugIns},
    {"lock", &Transaction::lockDownPlugIns},
    {"find", &Transaction::findPlugIn},
};

Transaction::Transaction(platform::ipc::Message request, std::shared_ptr<ZPDIpcClient> client)
    : request_(std::move(request)),
      reply_(platform::ipc::createReply(request_)),
      client_(std::move(client)),
      connection_(client_->connection()),
      version_(unsignedFor("version")),
      type_(stringFor("request")) {}

Transaction::~Transaction() {
    if (leftOpen_)
        request_.ticket.takenOnLoop();
}

ZPDServer& Transaction::server() const {
    return client_->server();
}

void Transaction::leaveOpen() {
    server().assertOnServiceQueue();
    leftOpen_ = true;
}

void Transaction::dispatch() {
    server().assertOnServiceQueue();
    changesBefore_ = server().annotationChanges();
    if (!supportsVersion(version_)) {
        return fail(ZPDErrorCode::version,
                    ZPDErrorMakeFormat(ZPDErrorCode::version,
                                       "unsupported protocol version %d (current %d)", version_,
                                       ZPDaemonClient::currentProtocolVersion));
    }
    if (!client().acceptWork())
        return;
    server().services().types.mayHaveChanged();
    ZPDLogOps().debug("client %d requested %{public}s", client().pid(), type_.value_or("(null)"));
    platform::probe::request(client().pid(), type_ ? std::string(*type_).c_str() : nullptr);
    route();
}

// The current version and the one before it.
bool Transaction::supportsVersion(std::uint64_t version) {
    return (version & ~std::uint64_t{1}) == 2;
}

const Transaction::RequestType* Transaction::known(std::string_view type) {
    const auto found = std::ranges::find(requestTypes, type, &RequestType::type);
    return found == std::end(requestTypes) ? nullptr : found;
}

void Transaction::route() {
    if (!type_)
        return fail(ZPDErrorCode::invalidRequest, "invalid request format (missing type)");
    const RequestType* const row = known(*type_);
    if (!row)
        return fail(ZPDErrorCode::invalidRequest, "unrecognized request");
    (this->*row->handler)();
}

// A request that fails in its envelope, or asks for a record that was made already. Everything
// else may have to make records, or to read files.
bool Transaction::isBrief() const {
    if (!supportsVersion(version_) || !type_ || !known(*type_))
        return true;
    if (*type_ != "find" || request().contains("paths"))
        return false;
    const Value* const value = request().find("uuids");
    const auto uuid = value ? value->uuid() : std::nullopt;
    return !uuid || server().hasAtHand(*uuid);
}

std::optional<std::string_view> Transaction::stringFor(std::string_view key) const {
    const Value* const value = request().find(key);
    return value ? value->string() : std::nullopt;
}

std::uint64_t Transaction::unsignedFor(std::string_view key) const {
    const Value* const value = request().find(key);
    return value ? value->unsignedInteger().value_or(0) : 0;
}
