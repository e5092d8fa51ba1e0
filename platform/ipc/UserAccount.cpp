#include "platform/ipc/UserAccount.h"

#include <utility>

namespace platform::ipc {

bool UserAccount::open(std::size_t most) {
    if (connections_ >= most)
        return false;
    ++connections_;
    return true;
}

void UserAccount::release(std::size_t bytes) {
    const std::size_t before = waiting_.fetch_sub(bytes);
    if (before - bytes >= mostWaiting_ || !awaited_)
        return;
    std::vector<std::move_only_function<void()>> retries;
    {
        const std::lock_guard lock(mutex_);
        retries.swap(retries_);
        awaited_ = false;
    }
    for (auto& retry : retries)
        retry();
}

void UserAccount::whenRoom(std::move_only_function<void()> retry) {
    {
        const std::lock_guard lock(mutex_);
        retries_.push_back(std::move(retry));
        awaited_ = true;
    }
    release(0); // the room may have come in between
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
