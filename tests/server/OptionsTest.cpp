#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "zpd/ZPDOptions.h"

namespace {

std::optional<ZPDOptions> parse(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "zpd");
    std::vector<char*> argv;
    for (auto& argument : arguments)
        argv.push_back(argument.data());
    argv.push_back(nullptr);
    return ZPDOptions::parse(static_cast<int>(arguments.size()), argv.data());
}

TEST(Options, ReadTheLeadingDigitsOfTheCacheLimit) {
    const std::pair<const char*, std::uint32_t> cases[] = {
        {"abc", 0},
        {"", 0},
        {"12abc", 12},
        {" 12", 0},
        {"-5", 0},
        {"+5", 0},
        {"0017", 17},
        {"4294967295", 4294967295U},
        {"4294967296", 4294967295U},
        {"99999999999999999999999999", 4294967295U}};

    for (const auto& [text, limit] : cases) {
        const auto options = parse({"-c", text});
        ASSERT_TRUE(options) << text;
        EXPECT_EQ(options->cacheLimit, limit) << text;
    }
}

} // namespace
