#include "launcher/Supervisor.h"

#include <cerrno>
#include <chrono>
#include <csignal>
#include <utility>

#include "platform/confine/PreparedConfinement.h"

using namespace platform::launcher;
using platform::UniqueFd;

namespace {

// From SIGTERM to SIGKILL.
constexpr std::chrono::milliseconds graceTime{2'000};

} // namespace

Supervisor::Supervisor(platform::ipc::Loop& loop, UniqueFd daemon, UniqueFd null)
    : loop_(loop),
      null_(std::move(null)),
      channel_(std::make_shared<LauncherChannel>(loop, std::move(daemon),
                                                 LauncherChannel::Reading::whileNothingWaits)) {
    channel_->start({.message = [this](const platform::Dictionary& message,
                                       auto& descriptors) { return take(message, descriptors); },
                     .drained = [this] { letAllGo(); },
                     .lost = [this](const char* fault) { daemonGone(fault); }});
}

Supervisor::~Supervisor() {
    channel_->close();
}

void Supervisor::tell(const News& news, std::vector<UniqueFd> descriptors) {
    const auto message = std::visit([](const auto& told) { return encode(told); }, news);
    (void)channel_->send(message, std::move(descriptors)); // all of them are small
}

bool Supervisor::take(const platform::Dictionary& message,
                      LauncherChannel::Descriptors& descriptors) {
    const auto order = decodeOrder(message);
    if (!order)
        return false;
    if (const auto* ending = std::get_if<End>(&*order)) {
        end(ending->id);
        return true;
    }
    if (descriptors.size() < launchDescriptors)
        return false;
    Passed passed{std::move(descriptors[0]), std::move(descriptors[1])};
    descriptors.erase(descriptors.begin(), descriptors.begin() + launchDescriptors);
    const auto& wanted = std::get<Launch>(*order);
    if (instances_.contains(wanted.id))
        return false;
    launch(wanted, passed);
    return true;
}

void Supervisor::launch(const Launch& launch, const Passed& passed) {
    reap(); // so that the number of a group that is gone is not taken for the new one
    const auto fail = [&](const platform::Error& error) {
        tell(Failed{launch.id, static_cast<int>(error.code), error.description.value_or("")});
    };
    const auto confinement = platform::PreparedConfinement::prepare(launch.confinement);
    if (!confinement)
        return fail(confinement.error());
    auto child = makeChild(launch, passed, null_.get(), *confinement);
    if (!child)
        return fail(child.error());
    follow(launch.id, std::move(*child), confinement->describe());
}

void Supervisor::follow(Id id, Child child, platform::Dictionary confinement) {
    Instance& instance = instances_[id];
    instance.group = child.pid;
    instance.confinement = std::move(confinement);
    instance.child = loop_.watchDescriptor(std::move(child.status), [this, id] { look(id); });
    leaders_.emplace(child.pid, id);
    std::vector<UniqueFd> process;
    process.push_back(std::move(child.process));
    tell(Made{id, child.pid}, std::move(process));
    held_.push_back(id);
    if (!channel_->isWaiting())
        letAllGo();
}

void Supervisor::letAllGo() {
    for (const Id id : std::exchange(held_, {})) {
        const auto place = instances_.find(id);
        if (place == instances_.end() || !place->second.child)
            continue;
        place->second.wentOn = true;
        letGo(place->second.child->descriptor());
    }
}

// At how the instance's beginning goes.
void Supervisor::look(Id id) {
    Instance& instance = instances_.at(id);
    if (!instance.child)
        return;
    ChildOutcome outcome = readOutcome(instance.child->descriptor(), instance.failure);
    if (outcome == ChildOutcome::undecided)
        return;
    if (outcome == ChildOutcome::runs && !instance.wentOn) {
        instance.failure = {ChildStep::none, ECANCELED};
        outcome = ChildOutcome::failed;
    }
    instance.child.reset();
    instance.phase = outcome == ChildOutcome::runs ? Phase::running : Phase::unsuccessful;
    if (instance.phase == Phase::running)
        tell(Started{id, std::exchange(instance.confinement, {})});
}

void Supervisor::end(Id id) {
    const auto place = instances_.find(id);
    if (place == instances_.end() || !place->second.leads || place->second.grace)
        return;
    Instance& instance = place->second;
    ::kill(-instance.group, SIGTERM);
    ::kill(-instance.group, SIGCONT); // one that is stopped would not notice
    instance.grace = loop_.makeTimer();
    instance.grace->start(graceTime, [this, id] {
        const auto late = instances_.find(id);
        if (late != instances_.end() && late->second.leads)
            ::kill(-late->second.group, SIGKILL);
    });
}

void Supervisor::daemonGone(const char*) {
    daemonIsGone_ = true;
    for (const auto& [pid, id] : leaders_)
        ::kill(-pid, SIGKILL);
    reap();
}
