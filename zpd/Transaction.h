#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <unordered_map>
#include <vector>

#include "platform/ipc/Message.h"
#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace platform {
class SerialQueue;
}

class ZPDIpcClient;
class ZPDPlugIn;
class ZPDPlugInHold;
class ZPDServer;
struct ReplyForm;

// One request under way: what was asked, the reply that is being built, and who asked.
//
// Made when the request arrives; owned by the block that is queued for it and by whatever a
// handler leaves to be finished later. It keeps its client. Carried out on the service queue; a
// handler may finish it on another one.
//
// Each handler ends its transaction once, with `done` or one of the `fail` operations, and does not
// touch the reply afterwards. One that is not done when it returns has left it open (leaveOpen).
class Transaction : public std::enable_shared_from_this<Transaction> {
public:
    Transaction(platform::ipc::Message request, std::shared_ptr<ZPDIpcClient> client);
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    virtual ~Transaction();

    [[nodiscard]] ZPDIpcClient& client() const { return *client_; }

    [[nodiscard]] ZPDServer& server() const;

    [[nodiscard]] const platform::Dictionary& request() const { return request_.body; }

    [[nodiscard]] platform::Dictionary& reply() { return reply_.body; }

    // The request's protocol version.
    [[nodiscard]] std::uint64_t version() const { return version_; }

    // True for requests that are answered at once from what the daemon has in memory.
    [[nodiscard]] bool isBrief() const;

    // True when the program that connected, and no other that has its socket, wrote the request.
    [[nodiscard]] bool isVouchedFor() const { return request_.fromPeer && request_.greeted; }

    // Checks the envelope and calls the handler of the request's type.
    // REQUIRES: on the service queue
    void dispatch();

    // The handler has returned: the connection may hand out its next request.
    void taken() { request_.ticket.taken(); }

    // The same, but the next one comes in on the loop.
    void takenOnLoop() { request_.ticket.takenOnLoop(); }

    // For a handler that finishes its work elsewhere, as nothing that may take long runs on the
    // service queue: the connection's next request is taken up only when nobody holds this
    // transaction any more. So each client's requests are carried out in its order, and nobody
    // else waits.
    // REQUIRES: on the service queue
    void leaveOpen();

    [[nodiscard]] bool isLeftOpen() const { return leftOpen_; }

    // Gets each path with whether it could be resolved (then it is canonical, else as received),
    // and tells whether to go on; when not, it has failed the transaction.
    using PathBlock = std::function<bool(const std::string& path, bool resolved)>;
    // Walks "paths". False when the transaction has failed.
    [[nodiscard]] bool marshalPaths(const PathBlock& block);
    // The same, and then done: on `queue`, with the transaction left open meanwhile. However long
    // the list, whoever else has work for that queue gets a turn in between.
    // REQUIRES: on the service queue
    void processPaths(platform::SerialQueue& queue, PathBlock block);

    // The same with another end: `whole` is called back on the service queue.
    // REQUIRES: on the service queue
    void walkPaths(platform::SerialQueue& queue, PathBlock block, std::function<void()> whole);

    // Gets each plug-in and tells whether to go on; when not, it has failed the transaction.
    using PlugInBlock = std::function<bool(const std::shared_ptr<ZPDPlugIn>& plugIn)>;
    // Walks "uuids", with "paths" for what is not found. False when the transaction has failed;
    // what the block did before stands. REQUIRES: on the service queue
    [[nodiscard]] bool processUuidList(const PlugInBlock& block);
    // Finds out first where those "paths" lead that the walk will ask for, on the queue
    // "registration" with the transaction left open, and calls `then` back on the service queue;
    // at once where none is needed. REQUIRES: on the service queue
    void followListedPaths(std::function<void()> then);

    // Puts a converted result under "matches"; without one the key is left out.
    void setMatches(std::optional<platform::Value> matches);
    // Sends the reply; once they are on disk when the request changed annotations.
    void done();
    void fail(std::uint64_t code, std::string_view message);
    // One of our own errors goes out as it is; another's text goes out with `code`.
    void fail(std::uint64_t code, const platform::Error& error);

    // Gives the form the plug-in's stored annotation, or an empty one.
    // REQUIRES: on the service queue
    void addAnnotationForPlugIn(const ZPDPlugIn& plugIn, ReplyForm& form) const;
    // The plug-in's form, with its annotation, in its wire encoding: the one that is `kept`, if
    // any. Nothing, and a log line, when it cannot be made.
    // REQUIRES: on the service queue
    [[nodiscard]] std::optional<platform::SharedBytes>
    encodedForm(const ZPDPlugIn& plugIn, platform::SharedBytes kept) const;

private:
    struct RequestType;
    static const RequestType requestTypes[];

    // After so long a list lets others have the queue on which its paths are walked.
    static constexpr std::chrono::milliseconds longestTurn{20};

    [[nodiscard]] static bool supportsVersion(std::uint64_t version);
    [[nodiscard]] std::optional<std::string_view> stringFor(std::string_view key) const;
    [[nodiscard]] std::uint64_t unsignedFor(std::string_view key) const;
    // The row of a type; nothing for an unknown one.
    [[nodiscard]] static const RequestType* known(std::string_view type);
    void route();
    // Nothing when the transaction has failed.
    [[nodiscard]] const platform::Array* requestedPaths();

    // A list that is walked on some queue: whether to go on after each step, and whether the walk
    // came to the list's end.
    struct Walk {
        std::size_t count;
        std::function<bool(std::size_t index)> step;
        std::function<void(bool whole)> finish;
    };

    // However long the list, whoever else has work for that queue gets a turn in between. The
    // transaction is kept meanwhile.
    void takeTurns(platform::SerialQueue& queue, std::size_t first, Walk walk);
    void walkRequestedPaths(platform::SerialQueue& queue, PathBlock block,
                            std::function<void()> whole);
    // Goes on on the service queue. Any thread.
    void comeBack(std::function<void()> part);
    [[nodiscard]] bool marshalPath(const platform::Value& entry, const PathBlock& block);
    void send(const platform::ipc::Reply& reply);

    // ---- zpd/requests/Registration.cpp
    void addPlugIns();
    void removePlugIns();
    void bulkPlugIns();
    [[nodiscard]] bool addPlugIn(const std::string& path, bool resolved);

    struct RemovalRight {
        bool granted = false;
        pid_t pid = 0; // of the client when it asked
    };

    [[nodiscard]] bool removePlugIn(const RemovalRight& right, const std::string& path,
                                    bool resolved);
    [[nodiscard]] bool hasPathToWalk() const;

    // ---- zpd/requests/Discovery.cpp
    void matchPlugIns();
    [[nodiscard]] std::vector<platform::SharedBytes>
    discover(const std::optional<platform::Dictionary>& rules, std::uint64_t flags);
    [[nodiscard]] bool mayDiscoverAll() const;

    // ---- zpd/requests/Lookup.cpp
    void findPlugIn();
    [[nodiscard]] std::shared_ptr<ZPDPlugIn> requestedPlugIn() const;
    [[nodiscard]] std::shared_ptr<ZPDPlugIn> findPlugInByUUID(const platform::Uuid& uuid) const;
    [[nodiscard]] std::shared_ptr<ZPDPlugIn> findPlugInByPathURL(std::string_view url) const;
    [[nodiscard]] std::shared_ptr<ZPDPlugIn> findPlugInByPath(const std::string& path) const;

    // ---- zpd/requests/UuidList.cpp
    [[nodiscard]] std::optional<platform::Uuid> listedUuid(const platform::Value& entry);
    [[nodiscard]] std::shared_ptr<ZPDPlugIn>
    listedPlugIn(const platform::Uuid& uuid, const platform::Value* path, std::size_t index) const;
    [[nodiscard]] bool followListedPath(std::size_t index);

    // ---- zpd/requests/Activation.cpp
    void readyPlugIns();
    void accessPlugIns();
    using PlugIns = std::vector<std::shared_ptr<ZPDPlugIn>>;
    // These fail the transaction when they answer false.
    [[nodiscard]] bool mayProvideEnvironment();
    [[nodiscard]] bool mayReady(const ZPDPlugIn& plugIn);
    void readyListed();
    void enable(const std::shared_ptr<const PlugIns>& plugIns, std::size_t first);
    void accessListed();

    // ---- zpd/requests/Holds.cpp
    void lockDownPlugIns();
    struct Collection;
    void releaseHolds(const platform::Array& tokens);
    // These fail the transaction when they answer false.
    [[nodiscard]] bool collect(Collection& collection, const std::string& path, bool resolved);
    [[nodiscard]] bool refuseBusy(const PlugIns& plugIns);
    void hold(const PlugIns& plugIns);
    void terminateHeld(const ZPDPlugInHold& hold);

    // ---- zpd/requests/Annotation.cpp
    void annotatePlugIns();
    void bulkAnnotatePlugIns();
    // These fail the transaction when they answer nothing, or false.
    [[nodiscard]] const platform::Dictionary* requestedAnnotations();
    [[nodiscard]] std::optional<platform::Dictionary>
    annotationChange(const platform::Dictionary& requested);
    void annotateListed(const platform::Dictionary& change);
    [[nodiscard]] bool annotate(const ZPDPlugIn& plugIn, const platform::Dictionary& change,
                                bool isFirst);
    [[nodiscard]] bool mayAllBeStored(const platform::Dictionary& extensions);
    [[nodiscard]] bool bulkAnnotate(std::string_view uuidText, const platform::Value& extension);
    // False when the annotation would grow too large.
    [[nodiscard]] bool store(const ZPDPlugIn& plugIn, const platform::Dictionary& annotation);
    [[nodiscard]] bool pluginShouldBeAutoEnabled(const ZPDPlugIn& plugIn) const;

    platform::ipc::Message request_;
    platform::ipc::Reply reply_;
    const std::shared_ptr<ZPDIpcClient> client_;
    const std::shared_ptr<platform::ipc::Connection> connection_;
    const std::uint64_t version_;
    const std::optional<std::string_view> type_; // in the request
    bool leftOpen_ = false;
    std::uint64_t changesBefore_ = 0; // of the annotations, when it was dispatched
    bool replyWaited_ = false;        // for what it reports being on disk
    bool annotates_ = false;          // also when it stores what is stored already
    // What listed paths lead to, by their place in the list.
    std::unordered_map<std::size_t, platform::Uuid> foundByPath_;
};
