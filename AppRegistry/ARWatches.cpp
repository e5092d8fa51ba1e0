#include "AppRegistry/ARWatches.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <sys/inotify.h>
#include <unistd.h>

#include "AppRegistry/ARFolder.h"
#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARScanner.h"

namespace {

// What was unlinked but is still open does not count.
constexpr std::uint32_t howToWatch = IN_ONLYDIR | IN_DONT_FOLLOW | IN_MASK_ADD | IN_EXCL_UNLINK;

// Reads at a time, so that whoever keeps the folders busy does not keep the lock.
constexpr int mostReads = 256;

} // namespace

const std::uint32_t ARWatches::nameEvents =
    IN_CREATE | IN_DELETE | IN_MOVED_TO | IN_MOVED_FROM | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF;
const std::uint32_t ARWatches::contentEvents = nameEvents | IN_CLOSE_WRITE | IN_MODIFY;

ARWatches::ARWatches() : inotify_(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
    scopes_.try_emplace(everything);
}

ARWatches::~ARWatches() = default;

int ARWatches::descriptor() const {
    const std::lock_guard lock(lock_);
    return inotify_.get();
}

// ---- Events

bool ARWatches::readEvents() {
    const std::lock_guard lock(lock_);
    drain();
    return !dirt_.empty();
}

bool ARWatches::isDirty() const {
    const std::lock_guard lock(lock_);
    return !dirt_.empty();
}

bool ARWatches::isDue(ARDirt::Clock::time_point now) const {
    const std::lock_guard lock(lock_);
    return dirt_.isDue(now);
}

ARDirt::Due ARWatches::takeDue(ARDirt::Clock::time_point now) {
    const std::lock_guard lock(lock_);
    return dirt_.take(now);
}

void ARWatches::markEverything() {
    const std::lock_guard lock(lock_);
    dirt_.markEverything(false, ARDirt::Clock::now());
}

void ARWatches::drain() {
    alignas(inotify_event) std::array<char, 16384> room;
    for (int i = 0; i < mostReads; ++i) {
        const ssize_t got = ::read(inotify_.get(), room.data(), room.size());
        if (got <= 0)
            return;
        for (std::size_t at = 0; at < static_cast<std::size_t>(got);) {
            const auto& event = *reinterpret_cast<const inotify_event*>(&room.at(at));
            take({event.wd, event.mask, event.len > 0 ? event.name : ""});
            at += sizeof event + event.len;
        }
    }
}

void ARWatches::take(const Event& event) {
    if ((event.what & IN_Q_OVERFLOW) != 0) {
        ARLog().error("changes of the folders came too fast: looking at everything");
        dirt_.markEverything(false, ARDirt::Clock::now());
        return;
    }
    const auto [begin, end] = interests_.equal_range(event.number);
    for (auto at = begin; at != end; ++at)
        concern(at->second, event);
    if ((event.what & IN_IGNORED) != 0) // the folder is no more
        interests_.erase(begin, end);
}

void ARWatches::concern(const Interest& interest, const Event& event) {
    const std::string_view name = event.name;
    const bool moved = (event.what & (IN_MOVE | IN_MOVE_SELF)) != 0;
    switch (interest.what) {
    case What::root:
        if (ARIsNamed(name, ARSuffixOf(interest.kind)))
            return mark(ARPathIn(interest.name, name), moved);
        if (name.empty())
            mark(everything, moved);
        return;
    case What::bundle:
        return mark(interest.scope->first, moved && name.empty());
    case What::plugIns:
        if (name.empty() || ARIsNamed(name, ARSuffixOf(ARKind::plugIn)))
            mark(interest.scope->first, moved);
        return;
    case What::way:
        if (name.empty() || name == interest.name)
            mark(interest.scope->first, moved);
    }
}

void ARWatches::mark(const std::string& item, bool moved) {
    const auto scope = scopes_.find(item);
    const bool away = scope != scopes_.end() && scope->second.awayPass != 0;
    if (item == everything || away)
        return dirt_.markEverything(moved, ARDirt::Clock::now());
    dirt_.mark(item, moved, ARDirt::Clock::now());
}

bool ARWatches::isIncomplete() const {
    const std::lock_guard lock(lock_);
    return incomplete_;
}

// ---- Passes

void ARWatches::beginPass(ARDepth depth) {
    const std::lock_guard lock(lock_);
    ++pass_;
    depth_ = depth;
}

void ARWatches::beginFullPass(ARDepth depth) {
    const std::lock_guard lock(lock_);
    ++pass_;
    depth_ = depth;
    missing_ = false;
    if (!inotify_)
        inotify_.reset(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
    dirt_ = ARDirt();
}

void ARWatches::endFullPass() {
    const std::lock_guard lock(lock_);
    for (auto at = interests_.begin(); at != interests_.end();) {
        const int number = at->first;
        at = interests_.equal_range(number).second;
        letGo(number, [this](const Interest& interest) { return interest.pass != pass_; });
    }
    for (auto scope = scopes_.begin(); scope != scopes_.end();) {
        const auto next = std::next(scope);
        if (scope->second.awayPass != pass_)
            scope->second.awayPass = 0;
        forgetIfUnused(scope);
        scope = next;
    }
    if (incomplete_ && !missing_)
        ARLog().info("all folders are watched again");
    incomplete_ = missing_;
}

void ARWatches::beginLook(const std::string& item) {
    const std::lock_guard lock(lock_);
    dirt_.forget(item);
    if (const auto scope = scopes_.find(item); scope != scopes_.end())
        scope->second.awayPass = 0;
}

void ARWatches::endLook(const std::string& item) {
    const std::lock_guard lock(lock_);
    const auto scope = scopes_.find(item);
    if (scope == scopes_.end())
        return;
    for (const int number : scope->second.numbers) {
        letGo(number, [&](const Interest& interest) {
            return interest.scope == &*scope && interest.pass != pass_;
        });
    }
    forgetIfUnused(scope);
}

void ARWatches::discardLook(const std::string& item) {
    const std::lock_guard lock(lock_);
    Scopes::value_type& scope = scopeOf(item);
    for (const int number : scope.second.numbers) {
        auto [at, end] = interests_.equal_range(number);
        for (; at != end; ++at) {
            if (at->second.scope == &scope)
                at->second.pass = 0;
        }
    }
}

bool ARWatches::hasMoved(const std::string& item) {
    const std::lock_guard lock(lock_);
    drain();
    return dirt_.moved(item);
}

bool ARWatches::hasInterest(int number, const Scopes::value_type& scope) const {
    const auto [begin, end] = interests_.equal_range(number);
    return std::any_of(begin, end, [&](const auto& at) { return at.second.scope == &scope; });
}

bool ARWatches::hasChanged(const std::string& item) {
    const std::lock_guard lock(lock_);
    drain();
    return dirt_.contains(item);
}

// Lets go of reasons for a watch; of the watch itself when none is left.
template <class Stale>
void ARWatches::letGo(int number, Stale&& stale) {
    auto [at, end] = interests_.equal_range(number);
    bool wanted = at == end;
    while (at != end) {
        const bool isStale = stale(at->second);
        wanted = wanted || !isStale;
        at = isStale ? interests_.erase(at) : std::next(at);
    }
    if (!wanted)
        ::inotify_rm_watch(inotify_.get(), number);
}

void ARWatches::forgetIfUnused(Scopes::iterator scope) {
    std::vector<int>& numbers = scope->second.numbers;
    std::ranges::sort(numbers);
    const auto repeated = std::ranges::unique(numbers);
    numbers.erase(repeated.begin(), repeated.end());
    std::erase_if(numbers, [&](int number) { return !hasInterest(number, *scope); });
    const bool used = !scope->second.numbers.empty() || scope->second.awayPass != 0;
    if (!used && scope->first != everything)
        scopes_.erase(scope);
}

void ARWatches::leadsAway(const std::string& item) {
    const std::lock_guard lock(lock_);
    scopeOf(item).second.awayPass = pass_;
}

void ARWatches::lookAgainLater() {
    const std::lock_guard lock(lock_);
    missing_ = incomplete_ = true;
}

// ---- Watches

void ARWatches::watchRoot(ARKind kind, const std::string& folder) {
    const std::lock_guard lock(lock_);
    const std::uint32_t events = kind == ARKind::extensionPoint ? contentEvents : nameEvents;
    add(folder, events, {&scopeOf(everything), What::root, kind, pass_, folder});
}

bool ARWatches::isRoot(ARKind kind, std::string_view folder) const {
    const std::lock_guard lock(lock_);
    const Scope& scope = scopes_.find(everything)->second;
    return std::ranges::any_of(scope.numbers, [&](int number) {
        const auto [begin, end] = interests_.equal_range(number);
        return std::any_of(begin, end, [&](const auto& at) {
            const Interest& interest = at.second;
            return interest.what == What::root && interest.kind == kind && interest.name == folder;
        });
    });
}

void ARWatches::watchBundle(const std::string& item, std::string_view folder) {
    if (depth_ != ARDepth::everything)
        return;
    const std::lock_guard lock(lock_);
    add(std::string(folder), contentEvents, {&scopeOf(item), What::bundle, {}, pass_, {}});
}

void ARWatches::watchPlugIns(const std::string& item, const std::string& folder) {
    if (depth_ != ARDepth::everything)
        return;
    const std::lock_guard lock(lock_);
    add(folder, nameEvents, {&scopeOf(item), What::plugIns, {}, pass_, {}});
}

void ARWatches::watchWay(const std::string& item, const std::string& path) {
    const std::lock_guard lock(lock_);
    if (depth_ == ARDepth::everything || item == everything)
        walk({&scopeOf(item), What::way, {}, pass_, {}}, path, nameEvents);
}

void ARWatches::watchFile(const std::string& item, const std::string& path) {
    const std::lock_guard lock(lock_);
    if (depth_ == ARDepth::everything)
        walk({&scopeOf(item), What::way, {}, pass_, {}}, path, contentEvents);
}

// The kernel's number is known before any event of it can be read: events are read with the same
// lock. A folder that is watched already keeps its number.
void ARWatches::add(const std::string& folder, std::uint32_t events, Interest interest) {
    const int number = ::inotify_add_watch(inotify_.get(), folder.c_str(), events | howToWatch);
    if (number < 0) {
        if (errno != ENOENT && errno != ENOTDIR && (errno != EACCES || interest.what != What::way))
            cannotWatch(folder, errno);
        return;
    }
    const auto [begin, end] = interests_.equal_range(number);
    const auto known =
        std::find_if(begin, end, [&](const auto& at) { return at.second.isFor(interest); });
    if (known != end) {
        known->second.pass = pass_;
        return;
    }
    interest.scope->second.numbers.push_back(number);
    interests_.emplace(number, std::move(interest));
}

void ARWatches::cannotWatch(const std::string& folder, int number) {
    if (!incomplete_) {
        ARLog().error("cannot watch %{public}@: %{errno}d; the folders are looked at from time to "
                      "time",
                      folder, number);
    }
    missing_ = incomplete_ = true;
}

ARWatches::Scopes::value_type& ARWatches::scopeOf(const std::string& item) {
    return *scopes_.try_emplace(item).first;
}
