#include <gtest/gtest.h>

#include "platform/probe/Probes.h"

using namespace platform;

extern "C" volatile unsigned short zpd_request__input_semaphore;
extern "C" volatile unsigned short zpd_request__output_semaphore;

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
