#pragma once

#include <string>
#include <vector>

#include "platform/value/Value.h"

// The texts that a program begins with, arguments or environment, as execveat takes them. Owned by
// whoever launches; kept until the child was made.
class ProgramText {
public:
    explicit ProgramText(std::vector<std::string> texts);
    ProgramText(const ProgramText&) = delete;
    ProgramText& operator=(const ProgramText&) = delete;

    // These variables, and the one that tells of the socket in place of any of its name.
    [[nodiscard]] static std::vector<std::string>
    environment(const platform::Dictionary& variables);

    [[nodiscard]] char* const* pointers() const noexcept { return pointers_.data(); }

private:
    std::vector<std::string> texts_;
    std::vector<char*> pointers_;
};
