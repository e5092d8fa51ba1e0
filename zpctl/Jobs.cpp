#include "zpctl/Jobs.h"

#include <future>
#include <utility>

#include "platform/ipc/Message.h"
#include "platform/jobs/JobServer.h"
#include "platform/paths/Places.h"

namespace zpctl {

namespace {

using platform::Error;
using platform::ipc::ConnectionError;

// The client library tells of the connection's end as of any failure.
Failure failureOf(const Error& error) {
    const std::string why = error.description.value_or("the job manager gave no reason");
    const std::string path =
        platform::Places::forThisProcess().socketPath(platform::jobServiceName);
    if (why == platform::ipc::describe(ConnectionError::invalid))
        return {Status::noDaemon, "no daemon at " + path, {}};
    if (why == platform::ipc::describe(ConnectionError::interrupted))
        return goneWhileAsked();
    return {Status::refused, why, error.code};
}

} // namespace

template <class Result, class Ask>
std::expected<Result, Failure> Jobs::ask(Ask&& ask) {
    using Answer = std::expected<Result, Error>;
    // Shared, because the answer may still come when nobody waits for it any more.
    const auto promise = std::make_shared<std::promise<Answer>>();
    auto arrival = promise->get_future();
    ask([promise](Answer answer) { promise->set_value(std::move(answer)); });
    if (arrival.wait_for(timeout_) != std::future_status::ready)
        return std::unexpected(noAnswer(timeout_));
    Answer answer = arrival.get();
    if (!answer)
        return std::unexpected(failureOf(answer.error()));
    return *std::move(answer);
}

std::expected<platform::Array, Failure> Jobs::instances() {
    return ask<platform::Array>([&](auto block) { client_.list(std::move(block)); });
}

std::expected<platform::UniqueFd, Failure> Jobs::start(const platform::Uuid& uuid) {
    auto started =
        ask<ZPStartedPlugIn>([&](auto block) { client_.startPlugIn(uuid, std::move(block)); });
    if (!started)
        return std::unexpected(started.error());
    return std::move(started->socket);
}

} // namespace zpctl
