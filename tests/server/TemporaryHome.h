#pragma once

#include <cstdlib>
#include <optional>
#include <string>

#include "tests/platform/TestFolder.h"

// A home of the test's own, in force through the environment while this lives.
class TemporaryHome {
public:
    TemporaryHome() {
        if (const char* const before = std::getenv(variable))
            before_ = before;
        ::setenv(variable, folder_.path().c_str(), 1);
    }

    TemporaryHome(const TemporaryHome&) = delete;
    TemporaryHome& operator=(const TemporaryHome&) = delete;

    ~TemporaryHome() {
        if (before_)
            ::setenv(variable, before_->c_str(), 1);
        else
            ::unsetenv(variable);
    }

    [[nodiscard]] const TestFolder& folder() const { return folder_; }

private:
    static constexpr const char* variable = "ZEPHRIN_HOME";

    TestFolder folder_;
    std::optional<std::string> before_;
};
