#pragma once

#include <string_view>
#include <vector>

#include "platform/value/Value.h"

// The environment that a plug-in's process shall get, put together from several sources: what is
// added later stays. Only what a process can have counts: texts without NUL, under names that are
// not empty and hold neither "=" nor NUL; so that no entry can pass for another. A plain value.
class ZPDLaunchEnvironment {
public:
    void add(std::string_view name, const platform::Value& value);
    void add(const platform::Dictionary& entries);

    [[nodiscard]] platform::Dictionary dictionary() const { return platform::Dictionary(entries_); }

private:
    std::vector<platform::DictionaryEntry> entries_;
};
