#include <thread>

#include "bench/Bundles.h"
#include "bench/Bystander.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

constexpr std::size_t formSize = 4096;
constexpr std::size_t window = 64;

std::string sizes(const std::string& request, std::size_t reply) {
    return "request " + std::to_string(request.size()) + " B, reply " + std::to_string(reply) +
           " B";
}

// Asks and asks and never reads, until nothing more goes.
void fillUnread(e2e::WireClient& client, const std::string& request) {
    for (int idle = 0; idle < 20;) {
        idle = client.sendSome(request) > 0 ? 0 : idle + 1;
        if (idle > 0)
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
}

void besideRow(const Run& run, Cores cores, const std::string& name, double beside, double alone) {
    run.table.add({.name = name,
                   .cores = nameOf(cores),
                   .measured = beside,
                   .against = alone,
                   .unit = "us",
                   .goal = Goal{.bound = 1.5},
                   .note = "against the same alone"});
}

} // namespace

void findRows(const Run& run, Cores cores) {
    const e2e::Home home;
    fill(home, {.plugIns = run.scaled(1000)});
    const std::string path = addPlugInWithForm(home, formSize);
    Rig rig(home.path());
    const std::string request = findByUuidFrame(rig.client(), path);
    const std::size_t reply = replySize(rig.client(), request);
    Exchange find = rig.exchange(request);
    FloorExchange floor(request, reply);
    run.cores.asClient(cores);

    const Compared alone = compare(find, floor.exchange, run.plan);
    const auto row = [&](const char* name, double measured, double against, double bound) {
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = measured,
                       .against = against,
                       .unit = "us",
                       .goal = Goal{.bound = bound},
                       .note = sizes(request, reply)});
    };
    row("find, p50", alone.daemon.p50, alone.floor.p50, 1.3);
    row("find, p99", alone.daemon.p99, alone.floor.p99, 1.5);
    row("find, CPU of the daemon per request", alone.daemon.processor, alone.floor.processor, 1.5);

    Exchange byPath = rig.exchange(findByPathFrame(path));
    run.table.add({.name = "find by path instead of UUID, p50",
                   .cores = nameOf(cores),
                   .measured = compare(byPath, floor.exchange, run.plan).daemon.p50,
                   .against = alone.floor.p50,
                   .unit = "us"});

    const Rates rates = compareRates(find, floor.exchange, run.plan, window);
    run.table.add({.name = "find, 64 in flight",
                   .cores = nameOf(cores),
                   .measured = rates.daemon / 1000,
                   .against = rates.floor / 1000,
                   .unit = "k/s",
                   .goal = Goal{.bound = 0.25, .atLeast = true}});

    {
        e2e::WireClient deaf(rig.daemon().socketPath());
        fillUnread(deaf, request);
        const Compared beside = compare(find, floor.exchange, run.plan);
        besideRow(run, cores, "find beside a client that never reads, p50", beside.daemon.p50,
                  alone.daemon.p50);
    }
    if (!run.cores.leavesOne(cores))
        return; // the flood and the client would only take the core from each other
    // It keeps the daemon's queue for its connection full.
    const Bystander flood(run, cores, [&] {
        const e2e::WireClient client(rig.daemon().socketPath());
        Exchange exchange(client.fd(), rig.daemon().pid(), request, reply);
        for (;;)
            exchange.windowed(100000, 256);
    });
    const Compared beside = compare(find, floor.exchange, run.plan);
    besideRow(run, cores, "find beside a client that floods, p50", beside.daemon.p50,
              alone.daemon.p50);
}

} // namespace bench
