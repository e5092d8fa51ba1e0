#include <array>
#include <climits>
#include <cstdlib>
#include <stdexcept>

#include <openssl/evp.h>
#include <openssl/hmac.h>

#include "Zephrin/ZPSandboxExtension.h"
#include "bench/BareBroker.h"
#include "bench/Bundles.h"
#include "bench/Rig.h"
#include "bench/Rows.h"

namespace bench {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t window = 64;

template <class Act>
std::chrono::nanoseconds timed(Act&& act) {
    const Clock::time_point start = Clock::now();
    act();
    return Clock::now() - start;
}

// The least that a token takes: where its path really leads, and one MAC.
void issueBare(const std::string& path, std::size_t size) {
    std::array<char, PATH_MAX> real; // realpath fills it
    static const std::array<unsigned char, 32> secret{1, 2, 3};
    std::array<unsigned char, EVP_MAX_MD_SIZE> mac{};
    unsigned macSize = 0;
    std::string text(size, 't');
    if (!realpath(path.c_str(), real.data()) ||
        !HMAC(EVP_sha256(), secret.data(), static_cast<int>(secret.size()),
              reinterpret_cast<const unsigned char*>(text.data()), text.size(), mac.data(),
              &macSize))
        throw std::runtime_error("no token can be made of " + path);
}

std::vector<std::string> uuidsOfMix(Rig& rig, const e2e::Home& home, std::size_t count) {
    std::vector<std::string> uuids;
    for (std::size_t i = 0; i < count; ++i)
        uuids.push_back(uuidAt(rig.client(), pathOf(home, i)));
    return uuids;
}

std::string tokenOf(e2e::WireClient& client, const std::string& uuid) {
    client.send(accessFrame({uuid}));
    const auto reply = client.receive();
    return e2e::decode(reply.value().body)["extensions"].items().at(0).text();
}

// "access" of one plug-in at a time, and of many at once.
void issueRows(const Run& run, Cores cores, Rig& rig, const e2e::Home& home) {
    const std::vector<std::string> uuids = uuidsOfMix(rig, home, run.scaled(1000) / 10);
    const std::string request = accessFrame({uuids.front()});
    Exchange access = rig.exchange(request);
    FloorExchange floor(request, replySize(rig.client(), request));
    run.cores.asClient(cores);
    const auto row = [&](const std::string& name, double measured, double against, const char* unit,
                         const char* note) {
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = measured,
                       .against = against,
                       .unit = unit,
                       .note = note});
    };
    const std::size_t size = tokenOf(rig.client(), uuids.front()).size();
    const Plan slower{.rounds = run.plan.rounds, .perRound = std::max(run.plan.perRound / 10, 5)};
    const auto bare = [&](std::size_t count) {
        return Side{.once = [&home, size, count] {
            return timed([&] {
                for (std::size_t i = 0; i < count; ++i)
                    issueBare(pathOf(home, i), size);
            });
        }};
    };
    const char* const againstBare = "against a bare realpath and HMAC-SHA-256";

    const Compared one = compare(access, floor.exchange, run.plan);
    row("access, p50", one.daemon.p50, one.floor.p50, "us", "against a bare exchange");
    const Rates rates = compareRates(access, floor.exchange, run.plan, window);
    row("tokens issued, access of 1, 64 in flight", rates.daemon / 1000,
        1000 / compare(bare(1), bare(1), slower).floor.p50, "k/s", againstBare);

    Exchange many = rig.exchange(accessFrame(uuids));
    const Compared all =
        compare(Side{.once = [&] { return many.roundTrip(); }}, bare(uuids.size()), slower);
    const auto rate = [&](double p50) { return static_cast<double>(uuids.size()) / p50 * 1000; };
    row("tokens issued, access of " + std::to_string(uuids.size()), rate(all.daemon.p50),
        rate(all.floor.p50), "k/s", againstBare);
}

// A token made a descriptor of, and given back; and a file below its folder opened.
void consumeRows(const Run& run, Cores cores, const std::string& folder, const std::string& path,
                 const std::string& token) {
    constexpr std::size_t header = e2e::frameHeaderSize + 30; // and the reply's few words
    const BareBroker bare(folder, path, {.request = token.size() + header, .reply = header});
    run.cores.asClient(cores);
    const Side bareSide{.once = [&] { return timed([&] { bare.ask(); }); }};
    const auto row = [&](const char* name, const Side& side) {
        const Compared result = compare(side, bareSide, run.plan);
        run.table.add({.name = name,
                       .cores = nameOf(cores),
                       .measured = 1000 / result.daemon.p50,
                       .against = 1000 / result.floor.p50,
                       .unit = "k/s",
                       .note = "against a bare connect, open, passed descriptor and close"});
    };
    ZPSandboxExtension extension(token);
    row("tokens consumed and expelled", {.once = [&] {
            return timed([&] {
                extension.consume();
                if (extension.handle() < 0)
                    throw std::runtime_error("a token gave nothing");
                extension.expel();
            });
        }});
    extension.consume();
    row("files opened by the broker", {.once = [&] {
            return timed([&] {
                if (!extension.open("Info.plist"))
                    throw std::runtime_error("the broker opened nothing");
            });
        }});
}

} // namespace

void tokenRows(const Run& run, Cores cores) {
    const e2e::Home home;
    setenv("ZEPHRIN_HOME", home.path().c_str(), 1);
    fill(home, {.plugIns = run.scaled(1000)});
    Rig rig(home.path());
    const std::string path = pathOf(home, 0);
    const std::string token = tokenOf(rig.client(), uuidAt(rig.client(), path));
    issueRows(run, cores, rig, home);
    run.cores.asServer();
    consumeRows(run, cores, home.path(), path, token);
    unsetenv("ZEPHRIN_HOME");
}

} // namespace bench
