#pragma once

#include <cstdlib>

#include "tests/platform/TestFolder.h"

// A home of the test's own, in force through the environment while this lives.
class TemporaryHome {
public:
    TemporaryHome() { ::setenv(variable, folder_.path().c_str(), 1); }

    ~TemporaryHome() { ::unsetenv(variable); }

    [[nodiscard]] const TestFolder& folder() const { return folder_; }

private:
    static constexpr const char* variable = "ZEPHRIN_HOME";

    TestFolder folder_;
};
