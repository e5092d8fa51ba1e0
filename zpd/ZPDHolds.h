#pragma once

#include <cstddef>
#include <list>
#include <sys/types.h>
#include <unordered_map>
#include <vector>

#include "platform/value/Uuid.h"
#include "zpd/ZPDPlugInHold.h"

// The live holds, in the order in which they were placed, and what is asked of them all the time:
// however many there are, an answer takes as long. Owned by the server, which locks it.
class ZPDHolds {
public:
    [[nodiscard]] bool empty() const { return holds_.empty(); }

    [[nodiscard]] bool block(const platform::Uuid& plugIn) const {
        return blocked_.contains(plugIn);
    }

    // How many this client has.
    [[nodiscard]] std::size_t countOf(const ZPDIpcClient& client) const;
    // How many all clients of this user have.
    [[nodiscard]] std::size_t countOfUser(uid_t user) const;

    void add(const ZPDPlugInHold::Ptr& hold);

    // Each takes holds out, and answers with them; the first with none when the token is unknown.
    [[nodiscard]] ZPDPlugInHold::Ptr take(const platform::Uuid& token);
    [[nodiscard]] std::vector<ZPDPlugInHold::Ptr> takeAllOf(const ZPDIpcClient& client);
    [[nodiscard]] std::vector<ZPDPlugInHold::Ptr> takeAll();

private:
    using List = std::list<ZPDPlugInHold::Ptr>;

    void forget(const ZPDPlugInHold& hold);

    List holds_;
    std::unordered_map<platform::Uuid, List::iterator> byToken_;
    std::unordered_map<platform::Uuid, std::size_t> blocked_; // plug-ins, and by how many
    // A client's holds go before it does.
    std::unordered_map<const ZPDIpcClient*, List> byClient_;
};
