#include "examples/host/PlugInList.h"

#include <chrono>
#include <future>
#include <memory>

namespace example {

namespace {

using platform::Dictionary;
using platform::Value;
using Reply = ZPDaemonClient::Reply;

constexpr std::chrono::seconds patience(5);

Dictionary rulesFor(const std::string& extensionPoint) {
    Dictionary rules;
    if (!extensionPoint.empty())
        rules.set("HXExtensionPointIdentifier", extensionPoint);
    return rules;
}

std::vector<ZPPlugInCore::Ptr> recordsOf(const ZPDaemonClient& client, const Dictionary& reply) {
    std::vector<ZPPlugInCore::Ptr> records;
    const Value* matches = reply.find("matches");
    const auto forms = matches ? client.convertFromIPC(*matches) : std::nullopt;
    if (!forms || !forms->array())
        return records;
    for (const Value& form : *forms->array()) {
        if (auto record = form.dictionary() ? ZPPlugInCore::createWithForm(*form.dictionary())
                                            : ZPPlugInCore::Ptr())
            records.push_back(std::move(record));
    }
    return records;
}

} // namespace

std::expected<std::vector<ZPPlugInCore::Ptr>, std::string>
plugInsAt(ZPDaemonClient& daemon, const std::string& extensionPoint) {
    const auto arrived = std::make_shared<std::promise<Reply>>();
    auto arrival = arrived->get_future();
    daemon.matchPlugIns(rulesFor(extensionPoint), 0,
                        [arrived](const Reply& reply) { arrived->set_value(reply); });
    if (arrival.wait_for(patience) != std::future_status::ready)
        return std::unexpected("the daemon does not answer");
    const Reply reply = arrival.get();
    if (const auto error = ZPDaemonClient::errorInReply(reply))
        return std::unexpected(error->description.value_or("the daemon gave no reason"));
    return recordsOf(daemon, *reply);
}

} // namespace example
