#include <algorithm>
#include <cstring>
#include <elf.h>
#include <linux/perf_event.h>
#include <map>
#include <sstream>
#include <sys/syscall.h>
#include <unistd.h>

#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

struct Probe {
    std::uint64_t location = 0; // addresses in the program
    std::uint64_t semaphore = 0;
    std::size_t arguments = 0;
};

// What `readelf -n` shows of the provider "zpd", by the probe's name.
std::map<std::string, Probe> probesOf(const std::string& notes) {
    std::map<std::string, Probe> probes;
    std::istringstream lines(notes);
    std::string provider;
    std::string name;
    for (std::string line; std::getline(lines, line);) {
        std::istringstream words(line);
        std::string label;
        words >> label;
        if (label == "Provider:") {
            words >> provider;
        } else if (label == "Name:") {
            words >> name;
        } else if (label == "Location:" && provider == "zpd") {
            words >> std::hex >> probes[name].location;
            probes[name].semaphore = std::stoull(line.substr(line.rfind(' ') + 1), nullptr, 16);
        } else if (label == "Arguments:" && provider == "zpd") {
            probes[name].arguments = 0;
            for (std::string argument; words >> argument;)
                probes[name].arguments += argument.find('@') != std::string::npos;
        }
    }
    return probes;
}

class Probes : public DaemonTest {
protected:
    [[nodiscard]] std::map<std::string, Probe> probesOfDaemon() const {
        Program readelf({.command = {"/usr/bin/readelf", "-n", builtProgram("zpd")},
                         .errorFile = home / "errors",
                         .outputFile = home / "notes"});
        EXPECT_EQ(readelf.exitStatus(), 0) << readelf.errors();
        return probesOf(readFile(home / "notes"));
    }
};

// Counts how often one probe of a program fires, in whichever process, as tracers do it: with the
// probe's semaphore counted up while this lives.
class Counter {
public:
    Counter(const std::string& program, const Probe& probe) {
        const std::string image = readFile(program);
        perf_event_attr event{};
        event.size = sizeof event;
        event.type = static_cast<std::uint32_t>(std::stoul("0" + readFile(kindFile)));
        event.config = offsetOf(image, probe.semaphore) << 32;
        event.config1 = reinterpret_cast<std::uintptr_t>(program.c_str());
        event.config2 = offsetOf(image, probe.location);
        for (int cpu = 0; cpu < sysconf(_SC_NPROCESSORS_ONLN); ++cpu)
            files_.push_back(static_cast<int>(
                syscall(SYS_perf_event_open, &event, -1, cpu, -1, PERF_FLAG_FD_CLOEXEC)));
    }

    Counter(const Counter&) = delete;
    Counter& operator=(const Counter&) = delete;

    ~Counter() {
        for (const int file : files_)
            close(file);
    }

    [[nodiscard]] bool works() const { return std::ranges::min(files_) >= 0; }

    [[nodiscard]] std::uint64_t count() const {
        std::uint64_t sum = 0;
        for (const int file : files_) {
            std::uint64_t hits = 0;
            EXPECT_EQ(read(file, &hits, sizeof hits), ssize_t{sizeof hits});
            sum += hits;
        }
        return sum;
    }

private:
    static constexpr const char* kindFile = "/sys/bus/event_source/devices/uprobe/type";

    // Where in a program's file stands what it has at an address.
    static std::uint64_t offsetOf(const std::string& image, std::uint64_t address) {
        Elf64_Ehdr head{};
        std::memcpy(&head, image.data(), sizeof head);
        for (unsigned i = 0; i < head.e_phnum; ++i) {
            Elf64_Phdr part{};
            std::memcpy(&part, &image.at(head.e_phoff + i * sizeof part), sizeof part);
            if (part.p_type == PT_LOAD && address - part.p_vaddr < part.p_filesz)
                return address - part.p_vaddr + part.p_offset;
        }
        return 0;
    }

    std::vector<int> files_;
};

TEST_F(Probes, StandInTheProgramWithTheirSemaphores) {
    const std::map<std::string, Probe> probes = probesOfDaemon();
    const std::map<std::string, std::size_t> expected = {
        {"client__new", 1},     {"client__done", 1},  {"request__input", 2}, {"request", 2},
        {"request__output", 2}, {"discover__raw", 1}, {"plugin__add", 1},    {"plugin__remove", 2},
        {"plugin__ready", 1},   {"db__load", 2}};
    EXPECT_EQ(probes.size(), expected.size());
    for (const auto& [name, arguments] : expected) {
        SCOPED_TRACE(name);
        const auto found = probes.find(name);
        ASSERT_NE(found, probes.end());
        EXPECT_EQ(found->second.arguments, arguments);
        EXPECT_NE(found->second.semaphore, 0u);
    }
}

TEST_F(Probes, FireWithWhatTheyTellOf) {
    const std::string in = addAppWith(home, "In", {});
    const std::string program = home / "zpd"; // its own: other daemons do not count
    fs::copy(builtProgram("zpd"), program);
    std::map<std::string, Counter> counters;
    for (const auto& [name, probe] : probesOfDaemon())
        counters.try_emplace(name, program, probe);
    if (!std::ranges::all_of(counters, [](const auto& each) { return each.second.works(); }))
        GTEST_SKIP() << "cannot trace programs here";
    writeFile(home / "annotations", "damaged");
    start({.program = program});
    (void)client->request(pathsRequest("add", {in, in, "/none"}));
    (void)client->request(pathsRequest("remove", {"/none", in}));
    (void)match(*client);
    daemon.reset();
    const std::map<std::string, std::uint64_t> expected = {
        {"request__input", 3}, {"request", 3},  {"request__output", 3}, {"discover__raw", 1},
        {"plugin__add", 2},    {"db__load", 2}, {"plugin__remove", 1},  {"plugin__ready", 0}};
    for (const auto& [name, count] : expected)
        EXPECT_EQ(counters.at(name).count(), count) << name;
    EXPECT_GE(counters.at("client__new").count(), 1u);
}

} // namespace
} // namespace e2e
