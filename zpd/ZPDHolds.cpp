#include "zpd/ZPDHolds.h"

#include <utility>

#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugIn.h"

std::size_t ZPDHolds::countOf(const ZPDIpcClient& client) const {
    const auto found = byClient_.find(&client);
    return found == byClient_.end() ? 0 : found->second.size();
}

std::size_t ZPDHolds::countOfUser(uid_t user) const {
    std::size_t count = 0;
    for (const auto& [client, theirs] : byClient_)
        count += client->peer()->uid == user ? theirs.size() : 0;
    return count;
}

void ZPDHolds::add(const ZPDPlugInHold::Ptr& hold) {
    byToken_[hold->uuid()] = holds_.insert(holds_.end(), hold);
    for (const auto& plugIn : hold->blocked())
        ++blocked_[plugIn->uuid()];
    if (const auto client = hold->client())
        byClient_[client.get()].push_back(hold);
}

ZPDPlugInHold::Ptr ZPDHolds::take(const platform::Uuid& token) {
    const auto found = byToken_.find(token);
    if (found == byToken_.end())
        return nullptr;
    ZPDPlugInHold::Ptr hold = *found->second;
    const auto client = byClient_.find(hold->client().get());
    if (client != byClient_.end()) {
        client->second.remove(hold);
        if (client->second.empty())
            byClient_.erase(client);
    }
    forget(*hold);
    return hold;
}

std::vector<ZPDPlugInHold::Ptr> ZPDHolds::takeAllOf(const ZPDIpcClient& client) {
    const auto found = byClient_.find(&client);
    if (found == byClient_.end())
        return {};
    const List theirs = std::move(found->second);
    byClient_.erase(found);
    for (const auto& hold : theirs)
        forget(*hold);
    return {theirs.begin(), theirs.end()};
}

std::vector<ZPDPlugInHold::Ptr> ZPDHolds::takeAll() {
    const List all = std::exchange(holds_, {});
    byToken_.clear();
    blocked_.clear();
    byClient_.clear();
    return {all.begin(), all.end()};
}

void ZPDHolds::forget(const ZPDPlugInHold& hold) {
    for (const auto& plugIn : hold.blocked()) {
        const auto count = blocked_.find(plugIn->uuid());
        if (--count->second == 0)
            blocked_.erase(count);
    }
    const auto place = byToken_.find(hold.uuid());
    holds_.erase(place->second);
    byToken_.erase(place);
}
