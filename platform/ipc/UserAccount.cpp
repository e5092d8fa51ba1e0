#include "platform/ipc/UserAccount.h"

#include <limits>
#include <utility>

namespace platform::ipc {

namespace {

// Each release lets so many try again, not all: a user with a thousand connections must not make
// the loop look at a thousand of them each time.
constexpr std::size_t retriesPerRelease = 4;

} // namespace

bool UserAccount::open(std::size_t most) {
    if (connections_ >= most)
        return false;
    ++connections_;
    return true;
}

bool UserAccount::takeWide() noexcept {
    if (wide_.fetch_add(1) < mostWide)
        return true;
    leaveWide();
    return false;
}

bool UserAccount::fits(std::size_t bytes) const noexcept {
    const std::size_t waiting = waiting_;
    return waiting == 0 || waiting + bytes <= mostWaiting_;
}

bool UserAccount::reserve(std::size_t bytes) noexcept {
    if (!fits(bytes))
        return false;
    add(bytes);
    return true;
}

void UserAccount::release(std::size_t bytes) {
    const std::size_t left = waiting_.fetch_sub(bytes) - bytes;
    if (awaited_)
        wake(left == 0 ? std::numeric_limits<std::size_t>::max() : retriesPerRelease);
}

void UserAccount::wake(std::size_t most) {
    Retries woken;
    {
        const std::lock_guard lock(mutex_);
        for (; most > 0 && !retries_.empty(); --most) {
            woken.push_back(std::move(retries_.front()));
            retries_.pop_front();
        }
        awaited_ = !retries_.empty();
    }
    for (auto& retry : woken)
        retry();
}

void UserAccount::whenFits(std::size_t bytes, std::move_only_function<void()> retry) {
    {
        const std::lock_guard lock(mutex_);
        retries_.push_back(std::move(retry));
        awaited_ = true;
    }
    if (fits(bytes)) // the room came in between
        wake(retriesPerRelease);
}

std::shared_ptr<UserAccount> UserAccounts::of(uid_t uid) {
    std::weak_ptr<UserAccount>& place = accounts_[uid];
    std::shared_ptr<UserAccount> account = place.lock();
    if (account)
        return account;
    std::erase_if(accounts_, [](const auto& entry) { return entry.second.expired(); });
    account = std::make_shared<UserAccount>(mostWaiting_);
    accounts_[uid] = account;
    return account;
}

} // namespace platform::ipc
