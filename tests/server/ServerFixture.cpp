#include "tests/server/ServerFixture.h"

#include <stdexcept>
#include <unistd.h>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/ClientConnection.h"
#include "platform/queue/SerialQueue.h"
#include "tests/server/Awaited.h"

using platform::Dictionary;
using platform::Value;
using platform::ipc::ClientConnection;

ServerFixture::ServerFixture() {
    platform_.processes.paths[::getpid()] = clientPath;
    platform_.containers.folder = folder_ / "containers";
}

ServerFixture::~ServerFixture() {
    stopServer();
}

void ServerFixture::stopServer() {
    client_.reset();
    server_.reset();
}

std::shared_ptr<FakePlugIn> ServerFixture::addPlugIn(const std::string& identifier,
                                                     const std::string& version) {
    const std::string application = "/Applications/Host" + std::to_string(plugIns_++) + ".app";
    auto plugIn = std::make_shared<FakePlugIn>();
    plugIn->application = std::make_shared<FakeApplication>();
    plugIn->application->path = application;
    plugIn->path = application + "/PlugIns/" + identifier + ".appex";
    plugIn->identifier = identifier;
    plugIn->original = identifier;
    plugIn->info = Dictionary{
        {"BQBundleIdentifier", identifier},
        {"HXExtension",
         Dictionary{{"HXExtensionPointIdentifier", "com.example.point"},
                    {"HXExtensionAttributes", Dictionary{{"HXExtensionVersion", version}}}}}};
    platform_.workspace.installed.push_back(plugIn);
    platform_.workspace.move();
    return plugIn;
}

void ServerFixture::setKey(FakePlugIn& plugIn, std::string_view key, Value value) {
    Dictionary extension = *plugIn.plugInDictionary();
    extension.set(key, std::move(value));
    plugIn.info->set("HXExtension", extension);
}

ZPDServer& ServerFixture::server() {
    if (!server_) {
        auto made =
            ZPDServer::create(platform_.services(), {.socketPath = folder_ / "zpd",
                                                     .databasePath = folder_ / "annotations"});
        if (!made)
            throw std::runtime_error(describe(made.error()));
        server_ = std::move(*made);
        server_->resume();
        queue_ = std::make_shared<platform::SerialQueue>("test_client");
        client_ = std::make_unique<ClientConnection>(folder_ / "zpd", queue_);
        client_->resume();
    }
    return *server_;
}

ServerFixture::Reply ServerFixture::ask(const Dictionary& request) {
    const Awaited<Reply> arrived;
    server();
    client_->sendWithReply(request, [arrived](Reply reply) { arrived.bring(std::move(reply)); });
    return arrived.get();
}

ServerFixture::Reply ServerFixture::ask(std::string_view type, Dictionary keys,
                                        std::uint64_t version) {
    keys.set("request", type);
    keys.set("version", version);
    return ask(keys);
}

std::string ServerFixture::failureOf(const Dictionary& request) {
    const Reply reply = ask(request);
    if (!reply)
        return "no reply: " + platform::ipc::describe(reply.error());
    const Value* const code = reply->find("errorcode");
    return code ? describe(*code) + " " + textIn(*reply, "error") : "";
}

std::optional<Value> ServerFixture::matchesIn(const Reply& reply) {
    const Value* const matches = reply ? reply->find("matches") : nullptr;
    if (!matches)
        return std::nullopt;
    return platform::ipc::decodeRecord(*matches->encoded()).value();
}

ServerFixture::Forms ServerFixture::match(std::uint64_t flags, Dictionary keys) {
    keys.set("flags", flags);
    const auto matches = matchesIn(ask("match", std::move(keys)));
    Forms forms;
    for (const Value& form : *matches.value().array())
        forms.push_back(*form.dictionary());
    return forms;
}

std::vector<std::string> ServerFixture::names(const Forms& forms) {
    std::vector<std::string> names;
    for (const Dictionary& form : forms)
        names.push_back(textIn(form, "identifier") + " " + textIn(form, "version"));
    return names;
}

std::string textIn(const Dictionary& form, std::string_view key) {
    const Value* const value = form.find(key);
    return std::string(value ? value->string().value_or("") : "");
}
