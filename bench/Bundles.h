#pragma once

#include <cstddef>
#include <string>

#include "tests/e2e/Home.h"

namespace bench {

// The extension points that the plug-ins are spread over, one after the other.
constexpr std::size_t extensionPoints = 10;
[[nodiscard]] std::string extensionPoint(std::size_t number);

// The mix of a home: applications of ten plug-ins each (or more, where there are very many), every
// plug-in with `metadata` bytes of text in twenty entries of its Info.plist.
struct Mix {
    std::size_t plugIns = 1000;
    std::size_t perApplication = 10;
    std::size_t metadata = 2048;
    std::size_t executable = 8192; // bytes of each plug-in's executable; 0 for none
};

void fill(const e2e::Home& home, const Mix& mix);
// Of a plug-in of the usual mix, by its number.
[[nodiscard]] std::string pathOf(const e2e::Home& home, std::size_t number);

// A plug-in of an extension point of its own, with a form of about `size` bytes; answers its path.
[[nodiscard]] std::string addPlugInWithForm(const e2e::Home& home, std::size_t size);

// One that can be launched: it says one byte and waits for its host's end.
constexpr const char* runningIdentifier = "com.example.bench.running";
[[nodiscard]] std::string addRunningPlugIn(const e2e::Home& home);

} // namespace bench
