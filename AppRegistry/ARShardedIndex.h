#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <functional>
#include <memory>
#include <vector>

// A map whose copies share: copying costs the same however much is in it, and a change of a copy
// copies only the shard that it touches. `KeyOf` finds an item's key. A copy that others may read
// is not changed any more; any thread may read it.
template <class Item, class KeyOf>
class ARShardedIndex {
    static constexpr std::size_t shardCount = 256;
    using Shard = std::vector<Item>; // in order of the keys

public:
    [[nodiscard]] const Item* find(const auto& key) const {
        const auto& shard = shards_[shardOf(key)];
        if (!shard)
            return nullptr;
        const auto at = std::ranges::lower_bound(*shard, key, std::less<>(), KeyOf());
        return at != shard->end() && KeyOf()(*at) == key ? &*at : nullptr;
    }

    // Adds the item, or puts it in the place of the one with the same key.
    void put(Item item) {
        const auto key = KeyOf()(item);
        Shard& shard = writable(shardOf(key));
        const auto at = std::ranges::lower_bound(shard, key, std::less<>(), KeyOf());
        if (at != shard.end() && KeyOf()(*at) == key) {
            *at = std::move(item);
        } else {
            shard.insert(at, std::move(item));
        }
    }

    // The item under a key, to be changed in all but its key; null when there is none.
    [[nodiscard]] Item* edit(const auto& key) {
        if (!find(key))
            return nullptr;
        Shard& shard = writable(shardOf(key));
        return &*std::ranges::lower_bound(shard, key, std::less<>(), KeyOf());
    }

    void remove(const auto& key) {
        if (!find(key))
            return;
        Shard& shard = writable(shardOf(key));
        shard.erase(std::ranges::lower_bound(shard, key, std::less<>(), KeyOf()));
    }

private:
    template <class Key>
    static std::size_t shardOf(const Key& key) {
        return std::hash<Key>()(key) % shardCount;
    }

    Shard& writable(std::size_t number) {
        auto& shard = shards_[number];
        if (!shard) {
            shard = std::make_shared<Shard>();
        } else if (shard.use_count() > 1) {
            shard = std::make_shared<Shard>(*shard);
        }
        return *shard;
    }

    std::array<std::shared_ptr<Shard>, shardCount> shards_;
};
