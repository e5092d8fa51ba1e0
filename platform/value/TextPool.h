#pragma once

#include <cstddef>
#include <functional>
#include <string_view>
#include <unordered_set>

#include "platform/value/SharedBytes.h"

namespace platform {

// Gives equal texts one shared copy: for the keys of many like dictionaries that stay in memory.
// When it is full, further texts get copies of their own. Owned by whoever decodes; not locked.
class TextPool {
public:
    static constexpr std::size_t mostTexts = 4096;
    static constexpr std::size_t longestText = 128;

    [[nodiscard]] SharedBytes shared(std::string_view text);

private:
    struct Hash {
        using is_transparent = void;

        std::size_t operator()(std::string_view text) const {
            return std::hash<std::string_view>()(text);
        }

        std::size_t operator()(const SharedBytes& text) const { return (*this)(text.view()); }
    };

    struct Equal {
        using is_transparent = void;

        bool operator()(const auto& a, const auto& b) const { return view(a) == view(b); }

        static std::string_view view(std::string_view text) { return text; }

        static std::string_view view(const SharedBytes& text) { return text.view(); }
    };

    std::unordered_set<SharedBytes, Hash, Equal> texts_;
};

} // namespace platform
