#include "bench/Rig.h"

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

} // namespace

Rig::Rig(const std::string& home)
    : daemon_(home, {.service = "bench", .logLevel = "default"}), client_(daemon_.socketPath()) {
    limitWaiting(client_.fd());
}

Exchange Rig::exchange(const std::string& request) {
    return {client_.fd(), daemon_.pid(), request, replySize(client_, request)};
}

std::string findFrame(const std::string& path) {
    const Item body = e2e::envelope("find", Item::map({{"paths", "file://" + path}}));
    return e2e::Frame{.id = 1, .body = encode(body)}.bytes();
}

std::string matchFrame(const std::string& point) {
    const Item rules = Item::map({{"HXExtensionPointIdentifier", point}});
    const Item body = e2e::envelope("match", Item::map({{"rules", rules}}));
    return e2e::Frame{.id = 1, .body = encode(body)}.bytes();
}

std::size_t replySize(e2e::WireClient& client, const std::string& request) {
    client.send(request);
    const std::optional<e2e::Frame> reply = client.receive(std::chrono::seconds(60));
    if (!reply)
        throw std::runtime_error("the daemon ended the connection");
    return e2e::frameHeaderSize + reply->body.size();
}

} // namespace bench
