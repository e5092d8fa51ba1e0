#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "AppRegistry/ARBundleRow.h"

using ARRowPtr = std::shared_ptr<const ARBundleRow>;

// Everything that the registry keeps, by path: what a pass compares the folders with. Holds
// withdrawn entries too, which readers never see. Owned by the registry, used on its queue.
class ARModel {
public:
    struct Entry {
        ARRowPtr row;
        std::uint64_t seen = 0;    // the number of the pass that met it last
        Entry* previous = nullptr; // among the plug-ins within one application
        Entry* next = nullptr;
    };

    void fill(std::vector<ARBundleRow> rows);

    [[nodiscard]] Entry* find(std::string_view path);
    // Adds a row, or puts it in the place of the one with the same path.
    Entry& put(ARRowPtr row);
    void remove(std::string_view path);

    [[nodiscard]] std::int64_t takeId() { return ++lastId_; }

    [[nodiscard]] std::uint64_t beginPass() { return ++pass_; }

    // All rows that `wanted` (called with each entry) picks, in order of registration.
    template <class Wanted>
    [[nodiscard]] std::vector<ARRowPtr> pick(Wanted&& wanted) const {
        std::vector<ARRowPtr> picked;
        for (const auto& [path, entry] : entries_) {
            if (wanted(entry))
                picked.push_back(entry.row);
        }
        sortById(picked);
        return picked;
    }

    // The same of one item alone: of what lies at its path and, if that is an application, of the
    // plug-ins in it.
    template <class Wanted>
    [[nodiscard]] std::vector<ARRowPtr> pickOf(std::string_view item, Wanted&& wanted) const {
        std::vector<ARRowPtr> picked;
        const auto itself = entries_.find(item);
        if (itself != entries_.end() && wanted(itself->second))
            picked.push_back(itself->second.row);
        for (const Entry* entry = firstWithin(item); entry; entry = entry->next) {
            if (wanted(*entry))
                picked.push_back(entry->row);
        }
        sortById(picked);
        return picked;
    }

private:
    struct Hash : std::hash<std::string_view> {
        using is_transparent = void;
    };

    static void sortById(std::vector<ARRowPtr>& rows);
    [[nodiscard]] const Entry* firstWithin(std::string_view application) const;
    void join(Entry& entry);
    void leave(Entry& entry);

    std::unordered_map<std::string_view, Entry> entries_; // keys lie in the rows
    // By application the first of its plug-ins.
    std::unordered_map<std::string, Entry*, Hash, std::equal_to<>> within_;
    Entry* lastJoined_ = nullptr; // there: the next one is most often of the same application
    std::int64_t lastId_ = 0;
    std::uint64_t pass_ = 0;
};
