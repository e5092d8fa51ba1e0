// Predicts words for a keyboard: each line is the beginning of a word, the answer at most three
// words that begin so, separated by blanks.

#include <algorithm>
#include <array>
#include <cstddef>
#include <string>
#include <string_view>

#include "examples/plugins/Conversation.h"

namespace {

constexpr std::size_t mostWords = 3;

// What people search for on a television, in alphabetical order.
constexpr auto words = std::to_array<std::string_view>(
    {"action",   "adventure", "animated", "archive",  "ballet",  "baseball", "basketball",
     "cartoon",  "channel",   "comedy",   "concert",  "cooking", "crime",    "documentary",
     "drama",    "episode",   "family",   "fantasy",  "film",    "football", "history",
     "horror",   "live",      "movie",    "music",    "mystery", "nature",   "news",
     "opera",    "quiz",      "recorded", "romance",  "science", "season",   "series",
     "subtitle", "tennis",    "theatre",  "thriller", "travel",  "western",  "wildlife"});
static_assert(std::ranges::is_sorted(words));

std::string predictions(std::string_view beginning) {
    std::string found;
    std::size_t count = 0;
    for (auto word = std::ranges::lower_bound(words, beginning);
         word != words.end() && word->starts_with(beginning) && count < mostWords;
         ++word, ++count) {
        if (!found.empty())
            found += ' ';
        found += *word;
    }
    return found;
}

} // namespace

int main() {
    return example::converse(predictions);
}
