#include "zpd/ZPDKeyPool.h"

#include <functional>
#include <vector>

using platform::Dictionary;
using platform::DictionaryEntry;
using platform::SharedBytes;

std::size_t ZPDKeyPool::Hash::operator()(std::string_view text) const {
    return std::hash<std::string_view>()(text);
}

std::size_t ZPDKeyPool::Hash::operator()(const SharedBytes& text) const {
    return (*this)(text.view());
}

Dictionary ZPDKeyPool::withSharedKeys(const Dictionary& dictionary) {
    const std::lock_guard lock(lock_);
    return rebuilt(dictionary);
}

Dictionary ZPDKeyPool::rebuilt(const Dictionary& dictionary) {
    std::vector<DictionaryEntry> entries;
    entries.reserve(dictionary.size());
    for (const DictionaryEntry& entry : dictionary) {
        const Dictionary* const nested = entry.value.dictionary();
        entries.push_back(
            {sharedKey(entry.key), nested ? platform::Value(rebuilt(*nested)) : entry.value});
    }
    return Dictionary(std::move(entries));
}

SharedBytes ZPDKeyPool::sharedKey(const SharedBytes& key) {
    const auto found = keys_.find(key);
    if (found != keys_.end())
        return *found;
    if (key.size() <= longestKey && keys_.size() < mostKeys)
        keys_.insert(key);
    return key;
}
