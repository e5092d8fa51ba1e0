#pragma once

#include <algorithm>
#include <cstddef>
#include <string>

#include "bench/Cores.h"
#include "bench/Exchange.h"
#include "bench/Table.h"

namespace bench {

// What all rows need. Owned by main(), outlives them.
struct Run {
    const CoreChoice& cores;
    Table& table;
    Plan plan;
    bool quick = false;

    // Sizes shrink in a quick run.
    [[nodiscard]] std::size_t scaled(std::size_t count) const {
        return quick ? std::max<std::size_t>(count / 50, 20) : count;
    }
};

[[nodiscard]] const char* nameOf(Cores cores);

// "find" alone, beside other clients, and with a window.
void findRows(const Run& run, Cores cores);
// "match" of a tenth of the plug-ins of a home.
void matchRows(const Run& run, Cores cores, std::size_t plugIns);
// "match" of nothing, among few and among many.
void nothingRows(const Run& run, Cores cores);
// Memory for each record.
void memoryRows(const Run& run);
// "annotate" with its sync, and "find" beside it.
void annotateRows(const Run& run, Cores cores);
// Applications that come while the daemon runs, many at once and one by one.
void installRows(const Run& run, Cores cores);
// From a change to the observers' blocks.
void notifyRows(const Run& run, Cores cores);
// "ready" beside "find".
void readyRows(const Run& run, Cores cores);
// From a host's start of a plug-in to the first byte that this says.
void launchRows(const Run& run, Cores cores);
// Tokens: issued by "access", and made descriptors of.
void tokenRows(const Run& run, Cores cores);
// From the start of the program to the first answer.
void startRows(const Run& run, Cores cores);

} // namespace bench
