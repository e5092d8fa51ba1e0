// zpd-bench: starts the daemon on homes full of bundles and prints how it compares with the least
// that the same work costs, measured by turns in the same run.

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>
#include <sys/statvfs.h>
#include <unistd.h>
#include <vector>

#include "bench/BareProgram.h"
#include "bench/Rows.h"

namespace bench {

const char* nameOf(Cores cores) {
    return cores == Cores::one ? "one" : "two";
}

namespace {

constexpr const char* usage =
    "Usage: zpd-bench [--quick] [--cores one|two] [ROWS...]\n"
    "Rows: find match match-many nothing memory start annotate notify install\n"
    "      ready launch tokens\n"
    "      (all of them when none is named)\n";

constexpr const char* memoryFolder = "/dev/shm";

struct Options {
    bool quick = false;
    bool one = true;
    bool two = true;
    std::vector<std::string> rows;
};

bool parse(int count, char** arguments, Options& options) {
    for (int i = 1; i < count; ++i) {
        const std::string word = arguments[i];
        const std::string next = i + 1 < count ? arguments[i + 1] : "";
        if (word == "--quick") {
            options.quick = true;
        } else if (word == "--cores" && (next == "one" || next == "two")) {
            options.one = next == "one";
            options.two = next == "two";
            ++i;
        } else if (word.starts_with("-")) {
            return false;
        } else {
            options.rows.push_back(word);
        }
    }
    return true;
}

struct Family {
    const char* name;
    void (*measure)(const Run& run, Cores cores);
    bool twice;  // on one core and on two
    bool onDisk; // the homes lie where temporary files do, even when there is memory for them
};

const Family families[] = {
    {"find", findRows, true, false},
    {"match", [](const Run& run, Cores cores) { matchRows(run, cores, 1000); }, true, false},
    {"match-many", [](const Run& run, Cores cores) { matchRows(run, cores, 10000); }, true, false},
    {"nothing", nothingRows, false, false},
    {"memory", [](const Run& run, Cores) { memoryRows(run); }, false, false},
    {"start", startRows, true, true},
    {"annotate", annotateRows, true, true},
    {"notify", notifyRows, true, true},
    {"install", installRows, true, true},
    {"ready", readyRows, true, false},
    {"launch", launchRows, true, true},
    {"tokens", tokenRows, true, false}};

// Homes of a hundred thousand bundles take minutes to make and remove on a disk; nothing that is
// measured there reads from it.
bool memoryHasRoom() {
    struct statvfs status{};
    constexpr unsigned long long wanted = 3ULL << 30;
    return access(memoryFolder, W_OK) == 0 && statvfs(memoryFolder, &status) == 0 &&
           status.f_bavail * status.f_frsize >= wanted;
}

void chooseFolder(const Family& family) {
    static const bool given = std::getenv("TMPDIR") != nullptr;
    static const bool room = memoryHasRoom();
    if (given)
        return;
    if (room && !family.onDisk)
        setenv("TMPDIR", memoryFolder, 1);
    else
        unsetenv("TMPDIR");
}

bool wanted(const Options& options, const Family& family) {
    if (options.rows.empty())
        return true;
    for (const std::string& row : options.rows) {
        if (row == family.name)
            return true;
    }
    return false;
}

void measure(const Options& options) {
    const CoreChoice choice;
    Table table;
    const Plan plan = options.quick ? Plan{.rounds = 5, .perRound = 100} : Plan{};
    const Run run{.cores = choice, .table = table, .plan = plan, .quick = options.quick};
    for (const Family& family : families) {
        if (!wanted(options, family))
            continue;
        for (const Cores cores : {Cores::one, Cores::two}) {
            const bool asked = cores == Cores::one ? options.one : options.two;
            if (!asked || (cores == Cores::two && !family.twice && options.one))
                continue;
            chooseFolder(family);
            choice.asServer();
            family.measure(run, cores);
        }
    }
    table.summary();
}

int run(int count, char** arguments) {
    if (count == 4 && std::strcmp(arguments[1], "--bare-warm") == 0)
        return bareWarmStart(arguments[2], arguments[3]);
    if (count == 4 && std::strcmp(arguments[1], "--bare-first") == 0)
        return bareFirstStart(arguments[2], arguments[3]);
    Options options;
    if (!parse(count, arguments, options)) {
        std::fputs(usage, stderr);
        return 2;
    }
    measure(options);
    return 0;
}

} // namespace
} // namespace bench

int main(int count, char** arguments) {
    try {
        return bench::run(count, arguments);
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "zpd-bench: %s\n", failure.what());
        return 1;
    }
}
