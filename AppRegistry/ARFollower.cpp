#include "AppRegistry/ARFollower.h"

#include <algorithm>
#include <fcntl.h>

#include "AppRegistry/ARRegistry.h"

using namespace std::chrono_literals;
using std::chrono::milliseconds;

namespace {

constexpr milliseconds afterStart = 100ms; // the first clients go first
constexpr milliseconds tick = 25ms;
// Where watches are missing: between two looks at everything at least this, and so many times as
// long as the last one took.
constexpr milliseconds shortestRest = 5s;
constexpr int restPerWork = 20;

using Clock = ARDirt::Clock;

milliseconds since(Clock::time_point begin) {
    return std::chrono::duration_cast<milliseconds>(Clock::now() - begin);
}

} // namespace

// Shared with the pass that is under way, which may end after its follower did. On the loop.
struct ARFollower::State : std::enable_shared_from_this<State> {
    State(platform::ipc::Loop& itsLoop, ARRegistry& itsRegistry)
        : loop(itsLoop),
          registry(itsRegistry),
          watches(itsRegistry.watches()),
          soon(itsLoop.makeTimer()),
          later(itsLoop.makeTimer()) {}

    void wait();
    void waitForEvents();
    void look();
    void looked();

    platform::ipc::Loop& loop;
    ARRegistry& registry;
    ARWatches& watches;
    std::unique_ptr<platform::ipc::Timer> soon;
    std::unique_ptr<platform::ipc::Timer> later;
    std::unique_ptr<platform::ipc::Watch> events;
    int watched = -1;
    bool waiting = false; // for `soon`
    bool looking = false; // a pass is under way
    bool resting = false; // `later` runs
    bool over = false;
    Clock::time_point began;
    milliseconds lastWork{0};
};

// A pass that took long is not followed by the next at once.
void ARFollower::State::wait() {
    if (waiting || looking || over)
        return;
    waiting = true;
    soon->start(std::clamp(lastWork, tick, milliseconds(1s)), [this] {
        waiting = false;
        look();
    });
}

void ARFollower::State::waitForEvents() {
    const int descriptor = watches.descriptor();
    if (descriptor == watched)
        return;
    platform::UniqueFd own(::fcntl(descriptor, F_DUPFD_CLOEXEC, 0));
    if (!own)
        return watches.lookAgainLater();
    watched = descriptor;
    events = loop.watchDescriptor(std::move(own), [this] {
        if (watches.readEvents())
            wait();
    });
}

void ARFollower::State::look() {
    if (!watches.isDue(Clock::now()))
        return watches.isDirty() ? wait() : void();
    looking = true;
    began = Clock::now();
    registry.follow([self = shared_from_this()] { self->loop.post([self] { self->looked(); }); });
}

void ARFollower::State::looked() {
    looking = false;
    if (over)
        return;
    lastWork = since(began);
    waitForEvents();
    if (watches.isDirty())
        wait();
    if (!watches.isIncomplete() || resting)
        return;
    resting = true;
    later->start(std::max(shortestRest, lastWork * restPerWork), [this] {
        resting = false;
        watches.markEverything();
        wait();
    });
}

ARFollower::ARFollower(platform::ipc::Loop& loop, ARRegistry& registry)
    : state_(std::make_shared<State>(loop, registry)) {}

ARFollower::~ARFollower() {
    state_->registry.onEventsTaken({});
    state_->over = true;
    state_->events.reset();
    state_->soon->cancel();
    state_->later->cancel();
}

void ARFollower::start() {
    State* const state = state_.get();
    state->registry.onEventsTaken([followed = std::weak_ptr(state_)] {
        if (const auto self = followed.lock())
            self->loop.post([self] { self->wait(); });
    });
    state->waitForEvents();
    state->watches.markEverything();
    state->lastWork = afterStart;
    state->wait();
}
