#include <cstdio>
#include <memory>
#include <regex>
#include <set>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/probe/Probes.h"

using namespace platform;
using testing::UnorderedElementsAre;

extern "C" volatile unsigned short zpd_request__input_semaphore;
extern "C" volatile unsigned short zpd_request__output_semaphore;

namespace {

// What a tracer sees: the notes of this very program.
std::string notesOfThisProgram() {
    const std::unique_ptr<FILE, int (*)(FILE*)> pipe(::popen("readelf -n /proc/$PPID/exe", "r"),
                                                     &::pclose);
    std::string text;
    for (int c = 0; pipe && (c = std::fgetc(pipe.get())) != EOF;)
        text += static_cast<char>(c);
    return text;
}

} // namespace

TEST(Probes, AreAllThereWithASemaphoreOfTheirOwn) {
    const std::regex note("Provider: zpd\\s+Name: (\\S+)\\s+Location: [^,]+, Base: [^,]+, "
                          "Semaphore: (0x[0-9a-f]+)");
    const std::string text = notesOfThisProgram();
    std::set<std::string> names;
    std::set<std::string> semaphores;
    for (std::sregex_iterator at(text.begin(), text.end(), note), end; at != end; ++at) {
        names.insert((*at)[1]);
        if (std::stoull((*at)[2], nullptr, 16) != 0)
            semaphores.insert((*at)[2]);
    }
    EXPECT_THAT(names,
                UnorderedElementsAre("client__new", "client__done", "request__input", "request",
                                     "request__output", "discover__raw", "plugin__add",
                                     "plugin__remove", "plugin__ready", "db__load"));
    EXPECT_EQ(semaphores.size(), names.size());
}

TEST(Probes, AreEnabledByTheirSemaphores) {
    EXPECT_FALSE(probe::requestInputEnabled());
    EXPECT_FALSE(probe::requestOutputEnabled());
    zpd_request__input_semaphore = 1;
    EXPECT_TRUE(probe::requestInputEnabled());
    EXPECT_FALSE(probe::requestOutputEnabled());
    zpd_request__output_semaphore = 2;
    EXPECT_TRUE(probe::requestOutputEnabled());
    zpd_request__input_semaphore = 0;
    zpd_request__output_semaphore = 0;
}
