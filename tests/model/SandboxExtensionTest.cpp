#include <cerrno>
#include <vector>

#include <gmock/gmock.h>

#include "Zephrin/ZPSandboxExtension.h"
#include "platform/sandbox/SandboxExtensions.h"
#include "tests/support/LogOf.h"
#include "zpd/ZPDPlugInSignature.h"

namespace {

using namespace testing;

struct FakeExtensions final : platform::SandboxExtensions {
    int failure = 0;
    std::vector<std::string> calls;

    std::expected<std::int64_t, int> consume(std::string_view token) override {
        calls.push_back("consume " + std::string(token));
        return failure ? std::unexpected(failure) : std::expected<std::int64_t, int>(7);
    }

    int release(std::int64_t handle) override {
        calls.push_back("release " + std::to_string(handle));
        return failure;
    }

    std::expected<platform::UniqueFd, int> open(std::string_view token,
                                                std::string_view path) override {
        calls.push_back("open " + std::string(token) + " " + std::string(path));
        return std::unexpected(ENOENT);
    }
};

TEST(SandboxExtension, IsConsumedAndExpelledOnce) {
    const auto sandbox = std::make_shared<FakeExtensions>();
    {
        ZPSandboxExtension extension("T", sandbox);
        extension.expel();
        EXPECT_EQ(extension.open("x").error(), EBADF);
        EXPECT_EQ(extension.handle(), -1);
        extension.consume();
        extension.consume();
        EXPECT_EQ(extension.handle(), 7);
        EXPECT_EQ(extension.open("x").error(), ENOENT);
        EXPECT_TRUE(extension.isEqual(ZPSandboxExtension("T", sandbox)));
        EXPECT_FALSE(extension.isEqual(ZPSandboxExtension("U", sandbox)));
        extension.expel();
        extension.expel();
        EXPECT_EQ(extension.handle(), -1);
        extension.consume();
    }
    EXPECT_THAT(sandbox->calls,
                ElementsAre("consume T", "open T x", "release 7", "consume T", "release 7"));
}

TEST(SandboxExtension, LogsWhatFails) {
    const auto sandbox = std::make_shared<FakeExtensions>();
    ZPSandboxExtension extension("T", sandbox);
    sandbox->failure = EACCES;
    EXPECT_THAT(
        logOf([&] { extension.consume(); }),
        HasSubstr("sandbox default: failed to consume extension <private> - errno=<private>"));
    EXPECT_EQ(extension.handle(), -1);
    EXPECT_EQ(logOf([&] { extension.expel(); }), "");
    extension.setHandle(5);
    EXPECT_THAT(
        logOf([&] { extension.expel(); }),
        HasSubstr("sandbox default: failed to release extension <private> - errno=<private>"));
    EXPECT_EQ(extension.handle(), -1);
}

TEST(PlugInSignature, IsAPlaceholderOfItsOwn) {
    const platform::Url url{platform::SharedBytes(std::string_view("file:///x/y.appex"))};
    const ZPDPlugInSignature first(url);
    const ZPDPlugInSignature second(url);
    EXPECT_NE(first.cdhash(), second.cdhash());
    EXPECT_EQ(first.requirement(), "dummy requirement");
    EXPECT_EQ(second.requirement(), first.requirement());
}

} // namespace
