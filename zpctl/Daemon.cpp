#include "zpctl/Daemon.h"

#include <cstdio>
#include <future>
#include <memory>
#include <poll.h>
#include <sys/eventfd.h>
#include <utility>

#include "Zephrin/FileURL.h"
#include "platform/ipc/Listener.h"
#include "platform/ipc/Message.h"
#include "platform/paths/Places.h"

namespace zpctl {

namespace {

std::string secondsText(std::chrono::milliseconds time) {
    char text[32];
    std::snprintf(text, sizeof text, "%g s", static_cast<double>(time.count()) / 1000);
    return text;
}

} // namespace

Failure noAnswer(std::chrono::milliseconds timeout) {
    return {Status::noDaemon, "the daemon did not answer within " + secondsText(timeout), {}};
}

Failure goneWhileAsked() {
    return {Status::noDaemon, "the daemon went away while it was asked", {}};
}

namespace {

using platform::Dictionary;
using platform::Uuid;
using platform::Value;
using platform::ipc::ConnectionError;

Failure disconnected(ConnectionError error, const std::string& socketPath) {
    if (error == ConnectionError::interrupted)
        return goneWhileAsked();
    const bool tooLong = socketPath.size() > platform::ipc::longestSocketPath;
    const char* why = tooLong ? " (the path is too long for a socket)" : "";
    return {Status::noDaemon, "no daemon at " + socketPath + why, {}};
}

std::string socketPathOf(const std::optional<std::string>& serviceName) {
    const std::string usual(ZPDaemonClient::defaultServiceName);
    return platform::Places::forThisProcess().socketPath(serviceName.value_or(usual));
}

std::vector<std::string> conflictsIn(const Dictionary& reply) {
    std::vector<std::string> identifiers;
    const Value* const found = reply.find("conflicts");
    if (!found || !found->array())
        return identifiers;
    for (const Value& conflict : *found->array()) {
        const auto* const record = conflict.dictionary();
        const Value* const identifier = record ? record->find("BQBundleIdentifier") : nullptr;
        const auto text = identifier ? identifier->string() : std::nullopt;
        identifiers.emplace_back(text.value_or("unknown"));
    }
    return identifiers;
}

Failure refused(const platform::Error& error, const Dictionary& reply) {
    return {Status::refused, error.description.value_or("the daemon gave no reason"), error.code,
            conflictsIn(reply)};
}

Failure unreadable(const char* what) {
    return {Status::refused, what, {}};
}

} // namespace

Daemon::Daemon(const std::optional<std::string>& serviceName, std::chrono::milliseconds timeout)
    : ended_(std::make_shared<platform::UniqueFd>(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK))),
      client_(serviceName),
      socketPath_(socketPathOf(serviceName)),
      timeout_(timeout) {
    client_.setInterruptionBlock([ended = ended_] { (void)::eventfd_write(ended->get(), 1); });
}

bool Daemon::hasEnded() const {
    ::pollfd watched = {ended(), POLLIN, 0};
    return ::poll(&watched, 1, 0) > 0;
}

std::expected<Dictionary, Failure> Daemon::ask(const Request& request) {
    // Shared, because the reply may still come when nobody waits for it any more.
    const auto promise = std::make_shared<std::promise<ZPDaemonClient::Reply>>();
    auto arrival = promise->get_future();
    request(client_, [promise](const ZPDaemonClient::Reply& reply) { promise->set_value(reply); });
    if (arrival.wait_for(timeout_) != std::future_status::ready)
        return std::unexpected(noAnswer(timeout_));
    ZPDaemonClient::Reply reply = arrival.get();
    if (!reply)
        return std::unexpected(disconnected(reply.error(), socketPath_));
    if (const auto error = ZPDaemonClient::errorInReply(reply))
        return std::unexpected(refused(*error, *reply));
    return *std::move(reply);
}

std::optional<Failure> Daemon::tell(const Request& request) {
    auto reply = ask(request);
    return reply ? std::nullopt : std::optional(std::move(reply.error()));
}

std::expected<Value, Failure> Daemon::askForMatches(const Request& request) {
    const auto reply = ask(request);
    if (!reply)
        return std::unexpected(reply.error());
    const Value* matches = reply->find("matches");
    if (!matches)
        return std::unexpected(unreadable("the daemon knows the plug-in but cannot describe it"));
    auto records = client_.convertFromIPC(*matches);
    if (!records)
        return std::unexpected(unreadable("the daemon's answer cannot be read"));
    return *std::move(records);
}

std::expected<Dictionary, Failure> Daemon::askForForm(const Request& request) {
    const auto matches = askForMatches(request);
    if (!matches)
        return std::unexpected(matches.error());
    if (!matches->dictionary())
        return std::unexpected(unreadable("the daemon's answer is not a plug-in"));
    return *matches->dictionary();
}

std::expected<std::vector<Dictionary>, Failure> Daemon::match(const Dictionary& rules,
                                                              std::uint64_t flags) {
    const auto matches = askForMatches([&](ZPDaemonClient& client, auto reply) {
        client.matchPlugIns(rules, flags, std::move(reply));
    });
    if (!matches)
        return std::unexpected(matches.error());
    if (!matches->array())
        return std::unexpected(unreadable("the daemon's answer is not a list of plug-ins"));
    std::vector<Dictionary> forms;
    for (const Value& form : *matches->array()) {
        if (form.dictionary())
            forms.push_back(*form.dictionary());
    }
    return forms;
}

std::expected<Dictionary, Failure> Daemon::find(const platform::Uuid& uuid) {
    return askForForm([&](ZPDaemonClient& client, auto reply) {
        client.findPlugInByUUID(uuid, std::move(reply));
    });
}

std::expected<Dictionary, Failure> Daemon::findAtPath(const std::string& path) {
    return askForForm([&](ZPDaemonClient& client, auto reply) {
        const platform::Url url{platform::SharedBytes(std::string_view(fileURLFromPath(path)))};
        client.findPlugInByPathURL(url, std::move(reply));
    });
}

std::optional<Failure> Daemon::annotate(const platform::Uuid& uuid, const Dictionary& annotation) {
    return tell([&](ZPDaemonClient& client, auto reply) {
        client.setPluginAnnotations({uuid}, annotation, std::move(reply));
    });
}

std::optional<Failure> Daemon::add(const std::vector<std::string>& paths) {
    return tell(
        [&](ZPDaemonClient& client, auto reply) { client.addPlugIns(paths, std::move(reply)); });
}

std::optional<Failure> Daemon::remove(const std::vector<std::string>& paths) {
    return tell(
        [&](ZPDaemonClient& client, auto reply) { client.removePlugIns(paths, std::move(reply)); });
}

std::optional<Failure> Daemon::ready(const std::vector<Uuid>& uuids,
                                     const std::optional<Dictionary>& environment) {
    return tell([&](ZPDaemonClient& client, auto reply) {
        Dictionary message = client.request("ready");
        ZPDaemonClient::setUuids(message, uuids);
        if (environment)
            message.set("environment", *environment);
        client.send(message, std::move(reply));
    });
}

std::expected<std::vector<std::string>, Failure> Daemon::access(const std::vector<Uuid>& uuids) {
    const auto reply = ask([&](ZPDaemonClient& client, auto block) {
        Dictionary message = client.request("access");
        ZPDaemonClient::setUuids(message, uuids);
        client.send(message, std::move(block));
    });
    if (!reply)
        return std::unexpected(reply.error());
    std::vector<std::string> tokens;
    const Value* const extensions = reply->find("extensions");
    if (extensions && extensions->array()) {
        for (const Value& token : *extensions->array())
            tokens.emplace_back(token.string().value_or(""));
    }
    if (tokens.size() != uuids.size())
        return std::unexpected(unreadable("the daemon's answer is not a token for each plug-in"));
    return tokens;
}

std::expected<Uuid, Failure> Daemon::hold(const std::vector<std::string>& paths,
                                          std::uint64_t flags) {
    const auto reply = ask([&](ZPDaemonClient& client, auto block) {
        client.holdPlugins(paths, flags, std::move(block));
    });
    if (!reply)
        return std::unexpected(reply.error());
    const Value* const token = reply->find("uuids");
    if (!token || !token->uuid())
        return std::unexpected(unreadable("the daemon's answer holds no token"));
    return *token->uuid();
}

std::optional<Failure> Daemon::release(const Uuid& token) {
    return tell(
        [&](ZPDaemonClient& client, auto reply) { client.releaseHold(token, std::move(reply)); });
}

} // namespace zpctl
