#include "bench/Rig.h"

#include <filesystem>
#include <stdexcept>
#include <sys/socket.h>

namespace bench {

using e2e::Item;

namespace {

// A lost reply ends the run instead of hanging it.
void limitWaiting(int fd) {
    const timeval patience{.tv_sec = 60, .tv_usec = 0};
    setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
}

const std::string& withFolder(const std::string& home) {
    std::filesystem::create_directories(home + "/store");
    return home;
}

std::string frameOf(const char* type, const Item& arguments) {
    return e2e::Frame{.id = 1, .body = encode(e2e::envelope(type, arguments))}.bytes();
}

} // namespace

Rig::Rig(const std::string& home)
    : store_(home + "/store/annotations"),
      daemon_(withFolder(home),
              {.service = "bench", .arguments = {"-d", store_}, .logLevel = "default"}),
      client_(daemon_.socketPath()) {
    limitWaiting(client_.fd());
}

Exchange Rig::exchange(const std::string& request) {
    return {client_.fd(), daemon_.pid(), request, replySize(client_, request)};
}

std::string findByPathFrame(const std::string& path) {
    return frameOf("find", Item::map({{"paths", "file://" + path}}));
}

std::string uuidAt(e2e::WireClient& client, const std::string& path) {
    client.send(findByPathFrame(path));
    const std::optional<e2e::Frame> reply = client.receive();
    return e2e::decode(reply.value().body)["matches"].embedded()["uuid"].text();
}

std::string findByUuidFrame(e2e::WireClient& client, const std::string& path) {
    return frameOf("find", Item::map({{"uuids", Item::uuid(uuidAt(client, path))}}));
}

std::string annotateFrame(const std::string& uuid, int election, const std::string& note) {
    Item annotations = Item::map({{"election", election}});
    if (!note.empty())
        annotations.set("extension", Item::map({{"com.example.bench.note", note}}));
    return frameOf("annotate", Item::map({{"annotations", annotations},
                                          {"uuids", Item::array({Item::uuid(uuid)})}}));
}

std::string readyFrame(const std::string& uuid) {
    return frameOf("ready", Item::map({{"uuids", Item::array({Item::uuid(uuid)})}}));
}

std::string accessFrame(const std::vector<std::string>& uuids) {
    Item list = Item::array({});
    for (const std::string& uuid : uuids)
        list.append(Item::uuid(uuid));
    return frameOf("access", Item::map({{"uuids", list}}));
}

std::string matchFrame(const std::string& point) {
    const Item rules = Item::map({{"HXExtensionPointIdentifier", point}});
    return frameOf("match", Item::map({{"rules", rules}}));
}

std::size_t replySize(e2e::WireClient& client, const std::string& request) {
    client.send(request);
    const std::optional<e2e::Frame> reply = client.receive(std::chrono::seconds(60));
    if (!reply)
        throw std::runtime_error("the daemon ended the connection");
    if (const Item body = e2e::decode(reply->body); body.has("error"))
        throw std::runtime_error("the daemon refused: " + body["error"].text());
    return e2e::frameHeaderSize + reply->body.size();
}

} // namespace bench
