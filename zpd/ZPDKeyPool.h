#pragma once

#include <cstddef>
#include <mutex>
#include <string_view>
#include <unordered_set>

#include "platform/value/SharedBytes.h"
#include "platform/value/Value.h"

// The keys of information dictionaries, and the names of extension points in them. The same few
// stand in every bundle: with one copy of each, a record takes less memory, and looking something
// up in many records touches less of it.
//
// Owned by the database, outlives its records. Any thread.
class ZPDKeyPool {
public:
    // An equal dictionary with the pool's texts, at every level that is reached through
    // dictionaries alone.
    [[nodiscard]] platform::Dictionary withSharedKeys(const platform::Dictionary& dictionary);

private:
    // What bundles can fill the pool with is bounded; further texts stay their own.
    static constexpr std::size_t mostTexts = 4096;
    static constexpr std::size_t longestText = 64;

    struct Hash {
        using is_transparent = void;
        std::size_t operator()(std::string_view text) const;
        std::size_t operator()(const platform::SharedBytes& text) const;
    };

    struct Equal {
        using is_transparent = void;

        template <class A, class B>
        bool operator()(const A& a, const B& b) const {
            return viewOf(a) == viewOf(b);
        }

        static std::string_view viewOf(std::string_view text) { return text; }

        static std::string_view viewOf(const platform::SharedBytes& text) { return text.view(); }
    };

    // REQUIRES: lock_ is held
    [[nodiscard]] platform::Dictionary rebuilt(const platform::Dictionary& dictionary);
    [[nodiscard]] platform::Value rebuilt(const platform::DictionaryEntry& entry);
    [[nodiscard]] platform::SharedBytes sharedText(const platform::SharedBytes& text);

    std::mutex lock_;
    std::unordered_set<platform::SharedBytes, Hash, Equal> texts_;
};
