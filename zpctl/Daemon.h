#pragma once

#include <chrono>
#include <cstdint>
#include <expected>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Zephrin/ZPDaemonClient.h"
#include "platform/file/File.h"
#include "platform/value/Value.h"
#include "zpctl/Verb.h"

namespace zpctl {

// Why a verb came to nothing: the exit status, and what a person reads about it.
struct Failure {
    Status status = Status::refused;
    std::string message;
    std::optional<std::int64_t> code;        // the daemon's, when it has refused
    std::vector<std::string> conflicts = {}; // identifiers of the busy plug-ins, when that is why
};

// What is said when the daemon is silent, or gone.
[[nodiscard]] Failure noAnswer(std::chrono::milliseconds timeout);
[[nodiscard]] Failure goneWhileAsked();

// A connection to the daemon for a tool that asks and waits. Replies arrive on the client
// library's queue; every call here blocks its thread until then, or until the time is up. Owned by
// the session; one thread.
class Daemon {
public:
    // No name is the usual service.
    Daemon(const std::optional<std::string>& serviceName, std::chrono::milliseconds timeout);

    // Forms of plug-ins; `flags` are the ZPDiscover bits.
    [[nodiscard]] std::expected<std::vector<platform::Dictionary>, Failure>
    match(const platform::Dictionary& rules, std::uint64_t flags);

    // The form of one plug-in.
    [[nodiscard]] std::expected<platform::Dictionary, Failure> find(const platform::Uuid& uuid);
    [[nodiscard]] std::expected<platform::Dictionary, Failure> findAtPath(const std::string& path);

    // What changes something. Nothing when it was done.
    [[nodiscard]] std::optional<Failure> annotate(const platform::Uuid& uuid,
                                                  const platform::Dictionary& annotation);
    [[nodiscard]] std::optional<Failure> add(const std::vector<std::string>& paths);
    [[nodiscard]] std::optional<Failure> remove(const std::vector<std::string>& paths);

    // Makes plug-ins ready for this process; the environment is for theirs.
    [[nodiscard]] std::optional<Failure>
    ready(const std::vector<platform::Uuid>& uuids,
          const std::optional<platform::Dictionary>& environment);
    // The tokens for the plug-ins' bundles, in their order.
    [[nodiscard]] std::expected<std::vector<std::string>, Failure>
    access(const std::vector<platform::Uuid>& uuids);

    // Places a hold, which lives as long as this; the answer is its token. `flags` are the bits of
    // "lock".
    [[nodiscard]] std::expected<platform::Uuid, Failure> hold(const std::vector<std::string>& paths,
                                                              std::uint64_t flags);
    [[nodiscard]] std::optional<Failure> release(const platform::Uuid& token);

    // A descriptor that is readable once the daemon has ended since the first request, even when it
    // is there again: holds ended with it.
    [[nodiscard]] int ended() const { return ended_->get(); }

    [[nodiscard]] bool hasEnded() const;

    // Bits of the flags of `hold`.
    static constexpr std::uint64_t holdPlugIns = 1; // the paths are of plug-ins, not applications
    static constexpr std::uint64_t holdUnlessBusy = 2;
    static constexpr std::uint64_t holdTerminates = 4;

private:
    using Request = std::function<void(ZPDaemonClient&, ZPDaemonClient::ReplyBlock)>;

    [[nodiscard]] std::expected<platform::Dictionary, Failure> ask(const Request& request);
    [[nodiscard]] std::optional<Failure> tell(const Request& request);
    // What stands under "matches" in the answer to a request.
    [[nodiscard]] std::expected<platform::Value, Failure> askForMatches(const Request& request);
    [[nodiscard]] std::expected<platform::Dictionary, Failure> askForForm(const Request& request);

    const std::shared_ptr<platform::UniqueFd> ended_; // counts; the client's block has it too
    ZPDaemonClient client_;
    const std::string socketPath_; // for messages
    const std::chrono::milliseconds timeout_;
};

} // namespace zpctl
