#include "platform/signing/SignedPrograms.h"

#include <algorithm>
#include <array>
#include <climits>
#include <mutex>
#include <unistd.h>

namespace platform {

namespace {

// Where an open file lies, as the kernel tells.
std::optional<std::string> pathOf(int file) {
    std::array<char, PATH_MAX> room;
    const std::string link = "/proc/self/fd/" + std::to_string(file);
    const ssize_t length = ::readlink(link.c_str(), room.data(), room.size());
    if (length <= 0 || static_cast<std::size_t>(length) == room.size())
        return std::nullopt;
    return std::string(room.data(), static_cast<std::size_t>(length));
}

bool isUnchanged(const Verification::File& file) {
    return stampOf(file.path) == file.stamp;
}

} // namespace

// What is known of one client's program. Owned by the client; prepared on the service's queue, so
// that what was found out is locked.
class SignedPrograms::Task final : public SigningTask {
public:
    Task(SignedPrograms& service, std::shared_ptr<const ipc::Peer> peer)
        : service_(service), peer_(std::move(peer)) {}

    void prepare(Done done) override {
        if (isKnown())
            return done();
        service_.queue_.async([this, done = std::move(done)]() mutable {
            if (!isKnown())
                learn(find());
            done();
        });
    }

    void recheck() override {
        const std::lock_guard lock(mutex_);
        if (found_ && found_->grant && !holds(*found_))
            found_.reset();
    }

    [[nodiscard]] std::expected<std::optional<Value>, Error>
    entitlement(std::string_view key) override {
        const std::lock_guard lock(mutex_);
        if (!found_ || !found_->grant)
            return std::nullopt;
        const Value* const value = found_->grant->entitlements.find(key);
        return value ? std::optional(*value) : std::nullopt;
    }

private:
    // Without a grant there is none as long as the client is connected.
    struct Found {
        std::optional<SignatureGrant> grant;
        std::vector<Verification::File> files; // that the grant rests on
    };

    // A file that had only just changed may change once more without a trace: then what was found
    // serves the request at hand, and is found out again for the next one.
    [[nodiscard]] bool isKnown() {
        const std::lock_guard lock(mutex_);
        return found_ && std::ranges::all_of(found_->files, &Verification::File::settled);
    }

    void learn(Found found) {
        const std::lock_guard lock(mutex_);
        found_ = std::move(found);
    }

    [[nodiscard]] bool holds(const Found& found) {
        return service_.isTrusted(found.grant->key) &&
               std::ranges::all_of(found.files, isUnchanged);
    }

    [[nodiscard]] Found find();

    SignedPrograms& service_;
    const std::shared_ptr<const ipc::Peer> peer_;
    std::mutex mutex_;
    std::optional<Found> found_;
};

// On the service's queue.
SignedPrograms::Task::Found SignedPrograms::Task::find() {
    const int running = peer_->executable.get();
    const auto path = peer_->executable ? pathOf(running) : std::nullopt;
    if (!path)
        return {};
    const Verification result = service_.verifier_.program(*path, running);
    service_.refusals_.report(*path, result);
    if (result.refusal())
        return {};
    return {result.grant(), result.files()};
}

std::unique_ptr<SigningTask> SignedPrograms::taskFor(std::shared_ptr<const ipc::Peer> peer) {
    return std::make_unique<Task>(*this, std::move(peer));
}

std::expected<SignatureGrant, std::string>
SignedPrograms::verifyBundle(const SignedBundle& bundle) {
    const Verification result = verifier_.bundle(bundle);
    if (auto refusal = result.refusal())
        return std::unexpected(std::move(*refusal));
    return result.grant();
}

bool SignedPrograms::isTrusted(std::string_view key) {
    return verifier_.trust().keys()->contains(key);
}

} // namespace platform
