#include "AppRegistry/ARPlugInUsers.h"

#include "AppRegistry/ARLog.h"
#include "platform/container/Containers.h"

std::optional<uid_t> ARPlugInUsers::of(std::string_view identifier) {
    if (!gives_)
        return std::nullopt;
    const std::lock_guard lock(lock_);
    if (const auto found = users_.find(identifier); found != users_.end())
        return found->second;
    adopt();
    if (const auto found = users_.find(identifier); found != users_.end())
        return found->second;
    const uid_t user = nextFree();
    if (user != shared)
        learn({std::string(identifier), user});
    return user;
}

void ARPlugInUsers::knowStored(const std::vector<ARPlugInUser>& users) {
    const std::lock_guard lock(lock_);
    for (const ARPlugInUser& user : users)
        enter(user);
}

void ARPlugInUsers::know(const std::vector<ARPlugInUser>& users) {
    const std::lock_guard lock(lock_);
    for (const ARPlugInUser& user : users)
        learn(user);
}

std::vector<ARPlugInUser> ARPlugInUsers::all() const {
    const std::lock_guard lock(lock_);
    return {users_.begin(), users_.end()};
}

void ARPlugInUsers::onNew(std::function<void()> handler) {
    const std::lock_guard lock(lock_);
    onNew_ = std::move(handler);
    if (onNew_ && !new_.empty())
        onNew_();
}

std::vector<ARPlugInUser> ARPlugInUsers::takeNew() {
    const std::lock_guard lock(lock_);
    return std::exchange(new_, {});
}

// ---- With the lock

bool ARPlugInUsers::enter(const ARPlugInUser& user) {
    const auto& [identifier, id] = user;
    if (id < first || id >= shared || users_.contains(identifier) || !given_.insert(id).second)
        return false;
    return users_.emplace(identifier, id).second;
}

void ARPlugInUsers::learn(const ARPlugInUser& user) {
    if (!enter(user))
        return;
    new_.push_back(user);
    if (onNew_ && new_.size() == 1)
        onNew_();
}

// Before the first one is given.
void ARPlugInUsers::adopt() {
    if (std::exchange(adopted_, true))
        return;
    for (const ARPlugInUser& owner : containers_.owners()) {
        learn(owner);
        given_.insert(owner.second); // also where its plug-in has another one
    }
}

uid_t ARPlugInUsers::nextFree() {
    while (next_ < shared && given_.contains(next_))
        ++next_;
    if (next_ == shared && !std::exchange(toldOfFull_, true))
        ARLog().error("all user ids of plug-ins are given: those that come now share %{public}u",
                      shared);
    return next_;
}
