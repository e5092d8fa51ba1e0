#include <chrono>
#include <cstdio>
#include <fcntl.h>
#include <stdexcept>
#include <unistd.h>

#include "bench/Bundles.h"
#include "bench/Bystander.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t annotated = 20; // plug-ins of which something is noted down
constexpr std::size_t noteSize = 200; // bytes

// What waits for a disk is measured less often.
Plan slower(const Plan& plan) {
    return {.rounds = plan.rounds, .perRound = std::max(plan.perRound / 20, 5)};
}

std::string annotate(Rig& rig, const std::string& frame) {
    rig.client().send(frame);
    const auto reply = rig.client().receive();
    if (!reply || e2e::decode(reply->body).has("error"))
        throw std::runtime_error("an annotation was refused");
    return reply->body;
}

// Elects one plug-in and takes that back, in turn: each time something changes.
class Elections {
public:
    Elections(Rig& rig, const std::string& uuid)
        : on_(rig.exchange(annotateFrame(uuid, 1))), off_(rig.exchange(annotateFrame(uuid, 2))) {}

    std::chrono::nanoseconds roundTrip() {
        elected_ = !elected_;
        return (elected_ ? on_ : off_).roundTrip();
    }

private:
    Exchange on_;
    Exchange off_;
    bool elected_ = false;
};

// The least that a save takes: a new file, synced, renamed, its folder synced.
class BareSave {
public:
    BareSave(std::string folder, std::string bytes)
        : folder_(std::move(folder)), bytes_(std::move(bytes)) {}

    std::chrono::nanoseconds save() const {
        const std::string made = folder_ + "/.bare";
        const Clock::time_point start = Clock::now();
        const int file = open(made.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        const bool written =
            write(file, bytes_.data(), bytes_.size()) == static_cast<ssize_t>(bytes_.size()) &&
            fsync(file) == 0;
        close(file);
        if (!written || std::rename(made.c_str(), (folder_ + "/bare").c_str()) != 0)
            throw std::runtime_error("cannot write below " + folder_);
        const int opened = open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
        if (fsync(opened) != 0)
            throw std::runtime_error("cannot sync " + folder_);
        close(opened);
        return Clock::now() - start;
    }

private:
    std::string folder_;
    std::string bytes_;
};

} // namespace

void annotateRows(const Run& run, Cores cores) {
    const e2e::Home home;
    fill(home, {.plugIns = run.scaled(1000)});
    const std::string found = addPlugInWithForm(home, 4096);
    Rig rig(home.path());
    for (std::size_t i = 0; i < annotated; ++i) {
        const std::string uuid = uuidAt(rig.client(), pathOf(home, i));
        annotate(rig, annotateFrame(uuid, 1, std::string(noteSize, 'n')));
    }
    const std::string uuid = uuidAt(rig.client(), pathOf(home, 0));
    Elections elections(rig, uuid);
    const std::string content = e2e::readFile(rig.store());
    const BareSave bare(home / "store", content);
    run.cores.asClient(cores);

    // On the daemon's core: cores are not equally far from the disk.
    const auto bareSave = [&] {
        run.cores.asServer();
        const auto took = bare.save();
        run.cores.asClient(cores);
        return took;
    };
    const Compared saved =
        compare(Side{.once = [&] { return elections.roundTrip(); }, .server = rig.daemon().pid()},
                Side{.once = bareSave, .server = getpid()}, slower(run.plan));
    const auto row = [&](const char* name, double measured, double against,
                         std::optional<Goal> goal) {
        run.table.add(
            {.name = name,
             .cores = nameOf(cores),
             .measured = measured,
             .against = against,
             .unit = "us",
             .goal = goal,
             .note = "against a bare save of the same " + std::to_string(content.size()) + " B"});
    };
    row("annotate with its sync, p50", saved.daemon.p50, saved.floor.p50, Goal{.bound = 1.3});
    row("annotate with its sync, p99", saved.daemon.p99, saved.floor.p99, std::nullopt);
    row("annotate, CPU of the daemon per request", saved.daemon.processor, saved.floor.processor,
        std::nullopt);

    const std::string request = findByUuidFrame(rig.client(), found);
    Exchange find = rig.exchange(request);
    FloorExchange floor(request, replySize(rig.client(), request));
    const Compared alone = compare(find, floor.exchange, run.plan);
    const Bystander busy(run, cores, [&] {
        Rig* const same = &rig;
        e2e::WireClient client(same->daemon().socketPath());
        for (int election = 1;; election = 3 - election) {
            client.send(annotateFrame(uuid, election));
            if (!client.receive(std::chrono::seconds(60)))
                return;
        }
    });
    const Compared beside = compare(find, floor.exchange, run.plan);
    run.table.add({.name = "find beside a client that annotates, p50",
                   .cores = nameOf(cores),
                   .measured = beside.daemon.p50,
                   .against = alone.daemon.p50,
                   .unit = "us",
                   .goal = Goal{.bound = 2.0},
                   .note = "against the same alone"});
}

} // namespace bench
