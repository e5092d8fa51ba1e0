#pragma once

#include <atomic>
#include <cstdint>
#include <expected>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ipc/Message.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {
class SerialQueue;

namespace ipc {
class ClientConnection;
}
} // namespace platform

// A host's way to talk to zpd: each call sends one request and gives the raw reply to a block.
//
// Owned by the host, one per process as a rule. All calls may be made from any thread and return
// at once. Blocks run one at a time on the queue "zpd_client", in the order in which the replies
// arrive; each is called exactly once. Letting the client go answers what is pending with the
// invalid error. A block may make further calls, but must not let the client go.
//
// The connection is made with the first request, and made again with the next request after the
// daemon was restarted; what was pending then is answered with the interrupted error. No call
// fails by itself: every outcome comes as a reply. Read failures with `errorInReply` (codes in
// ZPDError.h; transport failures have code 4), and records with `convertFromIPC`.
class ZPDaemonClient {
public:
    // The reply's keys and values, or what happened to the connection instead.
    using Reply = std::expected<platform::Dictionary, platform::ipc::ConnectionError>;
    using ReplyBlock = std::move_only_function<void(const Reply&)>;
    // Bundle paths and the plug-ins' registration UUIDs.
    using PlugInsByPath = std::map<std::string, platform::Uuid>;

    static constexpr std::int64_t currentProtocolVersion = 3;
    static constexpr std::string_view defaultServiceName = "com.tovana.zephrin.zpd";

    // Bits of the flags of `matchPlugIns`.
    static constexpr std::uint64_t ZPDiscoverAllVersions = 0x1;
    static constexpr std::uint64_t ZPDiscoverAllDuplicates = 0x4; // counts with the one above
    static constexpr std::uint64_t ZPDiscoverSystemOnly = 0x8;
    static constexpr std::uint64_t ZPDiscoverAll = 0x200; // needs an entitlement

    explicit ZPDaemonClient(std::optional<std::string> serviceName = std::nullopt);
    ZPDaemonClient(const ZPDaemonClient&) = delete;
    ZPDaemonClient& operator=(const ZPDaemonClient&) = delete;
    ~ZPDaemonClient();

    // What to do each time the daemon went away while this was connected to it: with it went what
    // it kept for this process, which are holds, what was made ready, and tokens. Called on
    // "zpd_client", before the answers to what was pending. Replaces the block before.
    void setInterruptionBlock(std::function<void()> block);

    // The version that every request carries.
    [[nodiscard]] std::int64_t protocolVersion() const noexcept { return protocolVersion_; }

    void setProtocolVersion(std::int64_t version) noexcept { protocolVersion_ = version; }

    // Registration. Paths are absolute.
    void addPlugIns(const std::vector<std::string>& paths, ReplyBlock reply);
    void removePlugIns(const std::vector<std::string>& paths, ReplyBlock reply);
    void bulkPlugins(std::uint64_t flags, ReplyBlock reply);

    // Activation. The environment is of text to text.
    void readyPlugIns(const PlugInsByPath& plugIns, std::uint64_t flags,
                      const std::optional<platform::Dictionary>& environment, ReplyBlock reply);
    void accessPlugIns(const PlugInsByPath& plugIns, std::uint64_t flags, ReplyBlock reply);

    // Look-up of one plug-in; "matches" of the reply is one form. The URL is of the bundle
    // ("file:///x/y.appex").
    void findPlugInByUUID(const platform::Uuid& uuid, ReplyBlock reply);
    void findPlugInByPathURL(const platform::Url& url, ReplyBlock reply);

    // Discovery; "matches" of the reply is an array of forms.
    void matchPlugIns(const platform::Dictionary& rules, std::uint64_t flags, ReplyBlock reply);

    // Annotations. The first applies one dictionary ("election", "extension") to all plug-ins, the
    // second has UUID texts as keys and the "extension" dictionaries as values.
    void setPluginAnnotations(const std::vector<platform::Uuid>& plugIns,
                              const platform::Dictionary& annotations, ReplyBlock reply);
    void bulkSetPluginAnnotations(const platform::Dictionary& annotations, ReplyBlock reply);

    // Holds. "uuids" of the first one's reply is the token for the second.
    void holdPlugins(const std::vector<std::string>& paths, std::uint64_t flags, ReplyBlock reply);
    void releaseHold(const platform::Uuid& token, ReplyBlock reply);

    // What requests are built of: a message with the envelope keys; the same with "paths"; "uuids"
    // and "paths" as parallel arrays; "uuids" alone.
    [[nodiscard]] platform::Dictionary request(std::string_view type) const;
    [[nodiscard]] platform::Dictionary request(std::string_view type,
                                               const std::vector<std::string>& paths) const;
    static void setPlugIns(platform::Dictionary& message, const PlugInsByPath& plugIns);
    static void setUuids(platform::Dictionary& message, const std::vector<platform::Uuid>& uuids);
    void send(const platform::Dictionary& message, ReplyBlock reply);

    // The error that a reply tells of; nothing for success. Throws std::logic_error for a message
    // without a code, which no sound daemon sends.
    [[nodiscard]] static std::optional<platform::Error> errorInReply(const Reply& reply);

    // A whole result (an array of forms, one form) as the one value that stands under "matches",
    // and back. Nothing unless the protocol version is 3.
    [[nodiscard]] static std::optional<platform::Value> convertToIPC(const platform::Value& object,
                                                                     std::uint64_t version);
    // The same of a form, or of forms, that are encoded already; they are shared.
    [[nodiscard]] static std::optional<platform::Value>
    convertToIPC(const platform::SharedBytes& encodedForm, std::uint64_t version);
    [[nodiscard]] static std::optional<platform::Value>
    convertToIPC(std::vector<platform::SharedBytes> encodedForms, std::uint64_t version);
    [[nodiscard]] std::optional<platform::Value> convertFromIPC(const platform::Value& value) const;

private:
    const std::shared_ptr<platform::SerialQueue> replyQueue_;

    // What the connection's events come to, also those that come after the end. Its block is
    // changed and called on the reply queue.
    struct Events {
        std::atomic<bool> letGo = false;
        std::function<void()> interruption;
    };

    const std::shared_ptr<Events> events_;
    std::atomic<std::int64_t> protocolVersion_ = currentProtocolVersion;
    const std::unique_ptr<platform::ipc::ClientConnection> zpd_;
};
