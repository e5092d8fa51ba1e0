#include "AppRegistry/ARDirt.h"

#include <algorithm>

void ARDirt::Since::extend(bool hasMoved, Clock::time_point now) {
    last = now;
    moved = moved || hasMoved;
}

bool ARDirt::Since::isDue(std::chrono::milliseconds longest, Clock::time_point now) const {
    return now - last >= quiet || now - first >= longest;
}

void ARDirt::mark(const std::string& item, bool moved, Clock::time_point now) {
    if (items_.size() >= mostItems && !items_.contains(item))
        return markEverything(false, now); // of so many some may be met halfway
    items_.try_emplace(item, Since{now, now}).first->second.extend(moved, now);
}

void ARDirt::markEverything(bool moved, Clock::time_point now) {
    if (!everything_)
        everything_ = Since{now, now};
    everything_->extend(moved, now);
}

bool ARDirt::isDue(Clock::time_point now) const {
    if (everything_ && everything_->isDue(longestForAll, now))
        return true;
    return std::ranges::any_of(
        items_, [&](const auto& item) { return item.second.isDue(longestForItem, now); });
}

ARDirt::Due ARDirt::take(Clock::time_point now) {
    Due due;
    if (everything_ && everything_->isDue(longestForAll, now)) {
        due.everything = true;
        everything_.reset();
        items_.clear();
        return due;
    }
    std::erase_if(items_, [&](const auto& item) {
        const bool isDue = item.second.isDue(longestForItem, now);
        if (isDue)
            due.items.push_back(item.first);
        return isDue;
    });
    std::ranges::sort(due.items);
    return due;
}

bool ARDirt::contains(const std::string& item) const {
    return everything_ || items_.contains(item);
}

bool ARDirt::moved(const std::string& item) const {
    if (everything_ && everything_->moved)
        return true;
    const auto found = items_.find(item);
    return found != items_.end() && found->second.moved;
}
