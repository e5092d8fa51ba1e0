#include "zpd/ZPDKeyPool.h"

#include <functional>
#include <vector>

#include "Zephrin/InfoKeys.h"

using platform::Dictionary;
using platform::DictionaryEntry;
using platform::SharedBytes;
using platform::Value;

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
    for (const DictionaryEntry& entry : dictionary)
        entries.push_back({sharedText(entry.key), rebuilt(entry)});
    return Dictionary(std::move(entries));
}

Value ZPDKeyPool::rebuilt(const DictionaryEntry& entry) {
    if (const Dictionary* const nested = entry.value.dictionary())
        return rebuilt(*nested);
    const SharedBytes* const text = entry.value.sharedString();
    if (text && entry.key.view() == InfoKey::extensionPoint)
        return Value::text(sharedText(*text));
    return entry.value;
}

SharedBytes ZPDKeyPool::sharedText(const SharedBytes& text) {
    const auto found = texts_.find(text);
    if (found != texts_.end())
        return *found;
    if (text.size() <= longestText && texts_.size() < mostTexts)
        texts_.insert(text);
    return text;
}
