#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <unordered_set>
#include <utility>
#include <vector>

namespace platform {
class Containers;
} // namespace platform

// The identifier of a plug-in and its user id.
using ARPlugInUser = std::pair<std::string, uid_t>;

// The user ids of plug-ins: one for each identifier, as for containers, whichever of its bundles
// runs. Given when it is first asked for and then never changed, nor given to another one. Those
// that containers have count as given, so that the database may be lost.
//
// Shared by the registry and its proxies as part of their context; the containers must outlive it.
// Any thread.
class ARPlugInUsers {
public:
    // The range, which no other allocation on a usual system comes near.
    static constexpr uid_t first = 1879048192;
    static constexpr uid_t count = uid_t{1} << 20;
    // Not given to any one plug-in: those share it that come when all others are given.
    static constexpr uid_t shared = first + count - 1;

    // Gives ids only where it is said to: to whom only root can.
    ARPlugInUsers(platform::Containers& containers, bool gives)
        : containers_(containers), gives_(gives) {}

    // The one of a plug-in. Nothing when none are given.
    [[nodiscard]] std::optional<uid_t> of(std::string_view identifier);

    // Takes what is known from elsewhere, as far as it agrees with what is known already.
    void knowStored(const std::vector<ARPlugInUser>& users);
    void know(const std::vector<ARPlugInUser>& users); // to be stored

    [[nodiscard]] std::vector<ARPlugInUser> all() const;

    // Calls `handler` when there is something new to store; none is handed out twice. The handler
    // must not wait.
    void onNew(std::function<void()> handler);
    [[nodiscard]] std::vector<ARPlugInUser> takeNew();

private:
    bool enter(const ARPlugInUser& user);
    void learn(const ARPlugInUser& user);
    void adopt();
    [[nodiscard]] uid_t nextFree();

    platform::Containers& containers_;
    const bool gives_;

    mutable std::mutex lock_; // held for a look or a change, and around `onNew_`
    std::map<std::string, uid_t, std::less<>> users_;
    std::unordered_set<uid_t> given_;
    uid_t next_ = first;
    bool adopted_ = false; // what containers have
    bool toldOfFull_ = false;
    std::vector<ARPlugInUser> new_;
    std::function<void()> onNew_;
};
