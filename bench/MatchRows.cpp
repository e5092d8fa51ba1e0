#include <algorithm>

#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

// Fewer repetitions for what takes longer.
Plan slower(const Plan& plan, int factor) {
    return {.rounds = std::max(plan.rounds / 4, 3),
            .perRound = std::max(plan.perRound / factor, 5)};
}

} // namespace

void matchRows(const Run& run, Cores cores, std::size_t plugIns) {
    const std::size_t count = run.scaled(plugIns);
    const e2e::Home home;
    fill(home, {.plugIns = count});
    Rig rig(home.path());
    const std::string request = matchFrame(extensionPoint(3));
    const std::size_t reply = replySize(rig.client(), request);
    Exchange match = rig.exchange(request);
    FloorExchange floor(request, reply);
    run.cores.asClient(cores);
    const Compared result =
        compare(match, floor.exchange, slower(run.plan, plugIns > 1000 ? 100 : 10));
    const std::string name = "match of 10 % of " + std::to_string(count);
    run.table.add({.name = name + ", p50",
                   .cores = nameOf(cores),
                   .measured = result.daemon.p50,
                   .against = result.floor.p50,
                   .unit = "us",
                   .goal = Goal{.bound = plugIns > 1000 ? 2.5 : 2.0},
                   .note = "reply " + std::to_string(reply / 1024) + " KB"});
    run.table.add({.name = name + ", CPU",
                   .cores = nameOf(cores),
                   .measured = result.daemon.processor,
                   .against = result.floor.processor,
                   .unit = "us"});
}

void nothingRows(const Run& run, Cores cores) {
    const std::string request = matchFrame("com.example.bench.none");
    const e2e::Home fewHome;
    fill(fewHome, {.plugIns = 100, .executable = 0});
    const e2e::Home manyHome;
    const std::size_t count = run.scaled(100000);
    fill(manyHome, {.plugIns = count, .perApplication = 1000, .metadata = 200, .executable = 0});
    Rig few(fewHome.path());
    Rig many(manyHome.path());
    Exchange amongFew = few.exchange(request);
    Exchange amongMany = many.exchange(request);
    run.cores.asClient(cores);
    const Compared result = compare(amongMany, amongFew, run.plan);
    run.table.add({.name = "match of nothing among " + std::to_string(count) + ", p50",
                   .cores = nameOf(cores),
                   .measured = result.daemon.p50,
                   .against = result.floor.p50,
                   .unit = "us",
                   .goal = Goal{.bound = 1.2},
                   .note = "against the same among 100"});
}

void memoryRows(const Run& run) {
    const e2e::Home emptyHome;
    const e2e::Home home;
    const std::size_t count = run.scaled(10000);
    fill(home, {.plugIns = count});
    // The second start: what the first pass needed is gone.
    { const Rig first(home.path()); }
    const Rig empty(emptyHome.path());
    Rig rig(home.path());
    const double started = static_cast<double>(rig.daemon().ownMemory());
    for (int pass = 0; pass < 2; ++pass) {
        for (std::size_t point = 0; point < extensionPoints; ++point)
            static_cast<void>(replySize(rig.client(), matchFrame(extensionPoint(point))));
    }
    const double base = static_cast<double>(empty.daemon().ownMemory());
    const double cached = static_cast<double>(rig.daemon().ownMemory());
    const auto each = [&](double bytes) { return bytes / 1024 / static_cast<double>(count); };
    run.table.add({.name = "anonymous memory for each of " + std::to_string(count) + " records",
                   .cores = "-",
                   .measured = cached / 1048576,
                   .against = base / 1048576,
                   .unit = "MB",
                   .ratio = each(cached - base),
                   .goal = Goal{.bound = 12, .unit = "KB"},
                   .note = "of it before the first match: " +
                           std::to_string(each(started - base)).substr(0, 4) +
                           " KB; against no plug-in at all"});
}

} // namespace bench
