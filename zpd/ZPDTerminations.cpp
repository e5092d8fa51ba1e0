#include "zpd/ZPDTerminations.h"

#include <string>
#include <utility>

#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDLog.h"
#include "platform/jobs/Jobs.h"
#include "zpd/ZPDJobName.h"

using platform::SerialQueue;
using platform::Uuid;

namespace {

constexpr int terminated = 0;

void logAnswer(int code, const Uuid& uuid) {
    if (code == platform::Jobs::nothingOnRecord)
        ZPDLogOps().debug("jobd reported no plug-ins on record for uuid=%@", uuid);
    else if (code == terminated)
        ZPDLogOps().info("one or more plug-ins have been terminated for uuid=%@", uuid);
    else
        ZPDLogOps().error("jobd error attempting to terminate plug-ins: error=%d for uuid=%@", code,
                          uuid);
}

} // namespace

// The wait for so many answers. Made on any thread, then touched on "killer-waiter" alone. It knows
// its queue, which so outlives the server where an answer comes later.
class ZPDTerminations::Wait {
public:
    Wait(std::size_t replies, Completion completion, std::shared_ptr<SerialQueue> queue)
        : queue_(std::move(queue)), replies_(replies), completion_(std::move(completion)) {}

    [[nodiscard]] SerialQueue& queue() const { return *queue_; }

    // False once it was completed, or let go.
    [[nodiscard]] bool isOpen() const { return static_cast<bool>(completion_); }

    void begin() {
        ZPDLogOps().debug("waiting for %d termination replies", replies_);
        begun_ = true;
    }

    void countAnswer() { ++answers_; }

    // Up to the next answer that is missing; true when none is.
    [[nodiscard]] bool goOn() {
        if (!begun_)
            return false;
        for (; logged_ < replies_ && logged_ <= answers_; ++logged_)
            ZPDLogOps().debug("awaiting termination reply #%d", logged_);
        return answers_ == replies_;
    }

    [[nodiscard]] Completion takeCompletion() { return std::exchange(completion_, nullptr); }

private:
    const std::shared_ptr<SerialQueue> queue_;
    const std::size_t replies_;
    Completion completion_;
    bool begun_ = false; // answers may come before
    std::size_t answers_ = 0;
    std::size_t logged_ = 0; // how many are, or were, awaited
};

ZPDTerminations::ZPDTerminations(platform::Jobs& jobs)
    : jobs_(jobs),
      killer_(std::make_shared<SerialQueue>("killer")),
      waiter_(std::make_shared<SerialQueue>("killer-waiter")) {}

void ZPDTerminations::terminate(const std::vector<ARZephrinProxy::Ptr>& plugIns,
                                Completion completion) {
    auto wait = std::make_shared<Wait>(plugIns.size(), std::move(completion), waiter_);
    waiter_->async([this, wait] { waits_.push_back(wait); });
    for (const auto& plugIn : plugIns)
        end(*plugIn, wait);
    waiter_->async([this, wait] {
        if (!wait->isOpen())
            return;
        wait->begin();
        goOn(wait);
    });
}

void ZPDTerminations::end(const ARZephrinProxy& plugIn, std::shared_ptr<Wait> wait) {
    const ZPDJobName name = ZPDJobName::of(plugIn);
    const Uuid uuid = plugIn.plugInUUID();
    ZPDLogOps().debug("requesting termination for %@(%@) jobd:%@ %@", name.identifier,
                      plugIn.bundleVersion().value_or("(null)"), name.version, uuid);
    jobs_.removeExternalService(name.identifier, name.version, killer_,
                                [this, uuid, wait = std::move(wait)](int code) {
                                    logAnswer(code, uuid);
                                    // This object may have gone, unless the wait is open.
                                    wait->queue().async([this, wait] {
                                        if (wait->isOpen())
                                            answered(wait);
                                    });
                                });
}

void ZPDTerminations::answered(const std::shared_ptr<Wait>& wait) {
    wait->countAnswer();
    goOn(wait);
}

void ZPDTerminations::goOn(const std::shared_ptr<Wait>& wait) {
    waiter_->assertOnQueue();
    if (!wait->goOn())
        return;
    std::erase(waits_, wait);
    ZPDLogOps().debug("sending termination reply");
    wait->takeCompletion()();
}

void ZPDTerminations::close() {
    std::vector<Completion> dropped;
    waiter_->sync([&] {
        for (const auto& wait : std::exchange(waits_, {}))
            dropped.push_back(wait->takeCompletion());
    });
}
