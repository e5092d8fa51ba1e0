#pragma once

#include <expected>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include <gtest/gtest.h>

#include "platform/ipc/Message.h"
#include "platform/value/Value.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/FakePlatform.h"
#include "zpd/ZPDServer.h"

namespace platform {
class SerialQueue;

namespace ipc {
class ClientConnection;
}
} // namespace platform

// The real server on a socket of its own, over services that the test decides, and one client
// that is connected with the first request. The test arranges the platform before that.
class ServerFixture : public testing::Test {
protected:
    using Dictionary = platform::Dictionary;
    using Reply = std::expected<Dictionary, platform::ipc::ConnectionError>;
    using Forms = std::vector<Dictionary>;

    ServerFixture();
    ~ServerFixture() override;

    // Adds a plug-in within an application of its own; the registry lists them in this order.
    std::shared_ptr<FakePlugIn> addPlugIn(const std::string& identifier,
                                          const std::string& version = "1");
    // Changes one entry of a plug-in's "HXExtension" dictionary.
    static void setKey(FakePlugIn& plugIn, std::string_view key, platform::Value value);

    // Started with the first call.
    ZPDServer& server();
    void stopServer();

    [[nodiscard]] bool hasServer() const { return server_ != nullptr; }

    [[nodiscard]] Reply ask(const Dictionary& request);
    // The keys besides the envelope's.
    [[nodiscard]] Reply ask(std::string_view type, Dictionary keys, std::uint64_t version = 3);
    // "code text" of a failure; empty for a success.
    [[nodiscard]] std::string failureOf(const Dictionary& request);
    // What stands under "matches", converted back; nothing when the key is absent.
    [[nodiscard]] static std::optional<platform::Value> matchesIn(const Reply& reply);

    [[nodiscard]] Forms match(std::uint64_t flags = 0, Dictionary keys = {});
    // "identifier version" of each.
    [[nodiscard]] static std::vector<std::string> names(const Forms& forms);

    static constexpr const char* clientPath = "/Applications/Client.app/client";

    TestFolder folder_;
    FakePlatform platform_;

private:
    std::unique_ptr<ZPDServer> server_;
    std::shared_ptr<platform::SerialQueue> queue_;
    std::unique_ptr<platform::ipc::ClientConnection> client_;
    int plugIns_ = 0;
};

// "text" under a key of a form; empty when there is none.
[[nodiscard]] std::string textIn(const platform::Dictionary& form, std::string_view key);
