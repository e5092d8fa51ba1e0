#pragma once

#include <sstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "platform/log/Log.h"
#include "tests/server/TemporaryHome.h"
#include "zpctl/CommandLine.h"

// Runs the tool's verbs within this process, on a home of the test's own without a daemon.
class ToolFixture : public testing::Test {
protected:
    using Status = zpctl::Status;
    using Words = std::vector<std::string>;

    struct Run {
        Status status = Status::done;
        std::string out;
        std::string err;
    };

    ToolFixture() { platform::log::silence(); }

    static Run run(const Words& arguments) {
        std::ostringstream out;
        std::ostringstream err;
        const Status status = zpctl::run(arguments, {.out = out, .err = err});
        return {status, out.str(), err.str()};
    }

    static Status statusOf(const Words& arguments) { return run(arguments).status; }

    const TemporaryHome temporary_;
    const TestFolder& home_ = temporary_.folder();
};
