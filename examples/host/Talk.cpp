#include "examples/host/Talk.h"

#include <chrono>
#include <cstring>
#include <future>
#include <memory>
#include <optional>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <utility>

#include "Zephrin/ZPJobClient.h"
#include "Zephrin/ZPSandboxExtension.h"

namespace example {

namespace {

using platform::Dictionary;
using platform::Error;
using platform::UniqueFd;
using Reply = ZPDaemonClient::Reply;

constexpr std::chrono::seconds patience(5);

std::string textOf(const Error& error) {
    return error.description.value_or("no reason was given");
}

// What `ask` gives to its block, once it does.
template <class Result, class Ask>
std::optional<Result> awaited(Ask&& ask) {
    const auto arrived = std::make_shared<std::promise<Result>>();
    auto arrival = arrived->get_future();
    ask([arrived](Result result) { arrived->set_value(std::move(result)); });
    if (arrival.wait_for(patience) != std::future_status::ready)
        return std::nullopt;
    return arrival.get();
}

std::expected<Dictionary, std::string> succeeded(const std::optional<Reply>& reply) {
    if (!reply)
        return std::unexpected("the daemon does not answer");
    if (const auto error = ZPDaemonClient::errorInReply(*reply))
        return std::unexpected(textOf(*error));
    return **reply;
}

std::expected<UniqueFd, std::string> started(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn) {
    const auto ready = succeeded(awaited<Reply>([&](auto block) {
        daemon.readyPlugIns({{plugIn.path(), plugIn.uuid()}}, 0, std::nullopt, std::move(block));
    }));
    if (!ready)
        return std::unexpected(ready.error());
    ZPJobClient jobs;
    auto outcome = awaited<std::expected<ZPStartedPlugIn, Error>>(
        [&](auto block) { jobs.startPlugIn(plugIn.uuid(), std::move(block)); });
    if (!outcome)
        return std::unexpected("the job manager does not answer");
    if (!*outcome)
        return std::unexpected(textOf(outcome->error()));
    return std::move((*outcome)->socket);
}

// The next line; nothing when the plug-in hangs up or takes too long.
std::optional<std::string> hear(const UniqueFd& socket) {
    constexpr int milliseconds = std::chrono::milliseconds(patience).count();
    std::string line;
    for (char c = 0;; line += c) {
        ::pollfd watched{socket.get(), POLLIN, 0};
        if (::poll(&watched, 1, milliseconds) <= 0 || ::recv(socket.get(), &c, 1, 0) != 1)
            return std::nullopt;
        if (c == '\n')
            return line;
    }
}

bool say(const UniqueFd& socket, const std::string& line) {
    const std::string text = line + "\n";
    return ::send(socket.get(), text.data(), text.size(), MSG_NOSIGNAL) ==
           static_cast<ssize_t>(text.size());
}

} // namespace

std::expected<std::vector<std::string>, std::string>
talkWith(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn,
         const std::vector<std::string>& lines) {
    const auto socket = started(daemon, plugIn);
    if (!socket)
        return std::unexpected(socket.error());
    std::vector<std::string> answers;
    for (const std::string& line : lines) {
        auto answer = say(*socket, line) ? hear(*socket) : std::nullopt;
        if (!answer)
            return std::unexpected("the plug-in hung up");
        answers.push_back(*std::move(answer));
    }
    return answers;
}

std::expected<std::size_t, std::string>
sizeByToken(ZPDaemonClient& daemon, const ZPPlugInCore& plugIn, const std::string& file) {
    const auto reply = succeeded(awaited<Reply>([&](auto block) {
        daemon.accessPlugIns({{plugIn.path(), plugIn.uuid()}}, 0, std::move(block));
    }));
    if (!reply)
        return std::unexpected(reply.error());
    const platform::Array* const tokens = reply->findArray("extensions");
    if (!tokens || tokens->empty())
        return std::unexpected("no token came");
    ZPSandboxExtension bundle(std::string((*tokens)[0].string().value_or("")));
    bundle.consume();
    const auto opened = bundle.open(file);
    struct ::stat status = {};
    if (!opened || ::fstat(opened->get(), &status) != 0)
        return std::unexpected(std::strerror(opened ? errno : opened.error()));
    return static_cast<std::size_t>(status.st_size);
}

} // namespace example
