#include <map>
#include <sstream>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"

namespace e2e {
namespace {

struct Probe {
    std::string semaphore;
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
            probes[name].semaphore = line.substr(line.rfind(' ') + 1);
        } else if (label == "Arguments:" && provider == "zpd") {
            probes[name].arguments = 0;
            for (std::string argument; words >> argument;)
                probes[name].arguments += argument.find('@') != std::string::npos;
        }
    }
    return probes;
}

TEST(Probes, StandInTheProgramWithTheirSemaphores) {
    const Home home;
    Program readelf({.command = {"/usr/bin/readelf", "-n", builtProgram("zpd")},
                     .errorFile = home / "errors",
                     .outputFile = home / "notes"});
    ASSERT_EQ(readelf.exitStatus(), 0) << readelf.errors();
    const std::map<std::string, Probe> probes = probesOf(readFile(home / "notes"));
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
        EXPECT_NE(std::stoull(found->second.semaphore, nullptr, 16), 0u);
    }
}

} // namespace
} // namespace e2e
