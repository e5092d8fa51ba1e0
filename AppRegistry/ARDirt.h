#pragma once

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

// Which of the registry's items have to be looked at again, and when: once they had a moment of
// quiet, so that one copy is one look. Bounded: past a number of items everything has to be looked
// at. Owned by ARWatches, which locks.
class ARDirt {
public:
    using Clock = std::chrono::steady_clock;

    static constexpr std::chrono::milliseconds quiet{20};
    // How long something may go on changing before it is looked at all the same.
    static constexpr std::chrono::milliseconds longestForAll{250};
    static constexpr std::chrono::milliseconds longestForItem{750};
    static constexpr std::size_t mostItems = 4096;

    struct Due {
        bool everything = false;
        std::vector<std::string> items; // by path, in order
    };

    // `moved`: something came or went as a whole, which a look must not have met halfway.
    void mark(const std::string& item, bool moved, Clock::time_point now);
    void markEverything(bool moved, Clock::time_point now);

    [[nodiscard]] bool empty() const { return !everything_ && items_.empty(); }

    [[nodiscard]] bool isDue(Clock::time_point now) const;
    // Everything, which includes all items, or the items that are due.
    [[nodiscard]] Due take(Clock::time_point now);

    // A look at the item begins: what happened before counts no more.
    void forget(const std::string& item) { items_.erase(item); }

    // What became of the item since then, or of everything.
    [[nodiscard]] bool contains(const std::string& item) const;
    [[nodiscard]] bool moved(const std::string& item) const;

private:
    struct Since {
        Clock::time_point first;
        Clock::time_point last;
        bool moved = false;

        void extend(bool hasMoved, Clock::time_point now);
        [[nodiscard]] bool isDue(std::chrono::milliseconds longest, Clock::time_point now) const;
    };

    std::unordered_map<std::string, Since> items_;
    std::optional<Since> everything_;
};
