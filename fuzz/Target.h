#pragma once

#include <string_view>

// What every fuzz target is made of: a target defines `run`; libFuzzer (Entry.cpp) or a replay of
// the kept inputs (Replay.cpp) calls it.
namespace fuzz {

// Reads one input as it may come from anybody.
void run(std::string_view input);

// Ends the process in every kind of build, asserts or not, so that the input is seen as a finding.
void require(bool holds, const char* what);

} // namespace fuzz
