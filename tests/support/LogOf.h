#pragma once

#include <string>

#include <gtest/gtest.h>

#include "platform/log/Log.h"

// What `act` logs.
template <class Act>
std::string logOf(Act&& act) {
    platform::log::flush();
    testing::internal::CaptureStderr();
    act();
    platform::log::flush();
    return testing::internal::GetCapturedStderr();
}
