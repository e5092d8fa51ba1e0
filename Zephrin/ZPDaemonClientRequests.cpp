// The requests that a host can make, each one message. Any thread.

#include <utility>

#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPDaemonClient.h"

using platform::Array;
using platform::Dictionary;
using platform::Uuid;
using platform::Value;

namespace {

template <class Items>
Array arrayOf(const Items& items) {
    return Array(std::vector<Value>(items.begin(), items.end()));
}

} // namespace

Dictionary ZPDaemonClient::request(std::string_view type) const {
    return Dictionary{{"request", type}, {"version", protocolVersion()}};
}

Dictionary ZPDaemonClient::request(std::string_view type,
                                   const std::vector<std::string>& paths) const {
    Dictionary message = request(type);
    message.set("paths", arrayOf(paths));
    return message;
}

void ZPDaemonClient::setPlugIns(Dictionary& message, const PlugInsByPath& plugIns) {
    std::vector<Value> paths;
    std::vector<Value> uuids;
    for (const auto& [path, uuid] : plugIns) {
        paths.emplace_back(path);
        uuids.emplace_back(uuid);
    }
    message.set("uuids", Array(std::move(uuids)));
    message.set("paths", Array(std::move(paths)));
}

void ZPDaemonClient::setUuids(Dictionary& message, const std::vector<Uuid>& uuids) {
    message.set("uuids", arrayOf(uuids));
}

void ZPDaemonClient::addPlugIns(const std::vector<std::string>& paths, ReplyBlock reply) {
    send(request("add", paths), std::move(reply));
}

void ZPDaemonClient::removePlugIns(const std::vector<std::string>& paths, ReplyBlock reply) {
    send(request("remove", paths), std::move(reply));
}

void ZPDaemonClient::bulkPlugins(std::uint64_t flags, ReplyBlock reply) {
    Dictionary message = request("bulk");
    message.set("flags", flags);
    send(message, std::move(reply));
}

void ZPDaemonClient::readyPlugIns(const PlugInsByPath& plugIns, std::uint64_t flags,
                                  const std::optional<Dictionary>& environment, ReplyBlock reply) {
    Dictionary message = request("ready");
    message.set("flags", flags);
    if (environment)
        message.set("environment", *environment);
    setPlugIns(message, plugIns);
    send(message, std::move(reply));
}

void ZPDaemonClient::accessPlugIns(const PlugInsByPath& plugIns, std::uint64_t flags,
                                   ReplyBlock reply) {
    Dictionary message = request("access");
    message.set("flags", flags);
    setPlugIns(message, plugIns);
    send(message, std::move(reply));
}

void ZPDaemonClient::findPlugInByUUID(const Uuid& uuid, ReplyBlock reply) {
    ZPDLogOps().standard("findPlugInByUUID %{public}@", uuid);
    Dictionary message = request("find");
    message.set("uuids", uuid);
    send(message, std::move(reply));
}

void ZPDaemonClient::findPlugInByPathURL(const platform::Url& url, ReplyBlock reply) {
    ZPDLogOps().standard("findPlugInByPathURL %{public}@", url.text.view());
    Dictionary message = request("find");
    message.set("paths", Value::text(url.text));
    send(message, std::move(reply));
}

void ZPDaemonClient::matchPlugIns(const Dictionary& rules, std::uint64_t flags, ReplyBlock reply) {
    Dictionary message = request("match");
    message.set("rules", rules);
    message.set("flags", flags);
    send(message, std::move(reply));
}

void ZPDaemonClient::setPluginAnnotations(const std::vector<Uuid>& plugIns,
                                          const Dictionary& annotations, ReplyBlock reply) {
    Dictionary message = request("annotate");
    setUuids(message, plugIns);
    message.set("annotations", annotations);
    send(message, std::move(reply));
}

void ZPDaemonClient::bulkSetPluginAnnotations(const Dictionary& annotations, ReplyBlock reply) {
    Dictionary message = request("bulk-annotate");
    message.set("annotations", annotations);
    send(message, std::move(reply));
}

void ZPDaemonClient::holdPlugins(const std::vector<std::string>& paths, std::uint64_t flags,
                                 ReplyBlock reply) {
    Dictionary message = request("lock", paths);
    message.set("flags", flags);
    send(message, std::move(reply));
}

void ZPDaemonClient::releaseHold(const Uuid& token, ReplyBlock reply) {
    Dictionary message = request("lock");
    setUuids(message, {token});
    send(message, std::move(reply));
}
