#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

void readyRows(const Run& run, Cores cores) {
    const e2e::Home home;
    fill(home, {.plugIns = run.scaled(1000)});
    const std::string path = addRunningPlugIn(home);
    Rig rig(home.path());
    const std::string request = readyFrame(uuidAt(rig.client(), path));
    Exchange ready = rig.exchange(request);
    Exchange find = rig.exchange(findByUuidFrame(rig.client(), path));
    FloorExchange floor(request, replySize(rig.client(), request));
    run.cores.asClient(cores);

    const Compared toFind = compare(ready, find, run.plan);
    const Compared toFloor = compare(ready, floor.exchange, run.plan);
    const auto row = [&](const char* name, double measured, double against, const char* note) {
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = measured,
                       .against = against,
                       .unit = "us",
                       .note = note});
    };
    row("ready, p50", toFind.daemon.p50, toFind.floor.p50, "against a find of the same plug-in");
    row("ready, p99", toFind.daemon.p99, toFind.floor.p99, "against a find of the same plug-in");
    row("ready, p50", toFloor.daemon.p50, toFloor.floor.p50, "against a bare exchange");
    row("ready, CPU of the daemon per request", toFind.daemon.processor, toFind.floor.processor,
        "against a find of the same plug-in");
}

} // namespace bench
