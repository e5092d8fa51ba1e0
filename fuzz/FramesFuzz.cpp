// A stream of bytes as frames, at the daemon's side and at the client's. The first byte decides how
// the stream is cut into pieces, and which of them another process wrote.

#include <random>
#include <string>

#include "fuzz/Target.h"
#include "platform/ipc/Frame.h"
#include "tests/ipc/Feed.h"

using platform::ipc::FrameReader;
using tests::Feed;

namespace {

// Answers with a mark for each byte: '!' where another process than the client wrote it.
std::string feedPieces(Feed& feed, std::string_view stream, unsigned seed) {
    std::minstd_rand random(seed);
    std::string marks;
    while (!stream.empty()) {
        const std::string_view piece = stream.substr(0, 1 + random() % 64);
        const bool fromPeer = random() % 4 != 0;
        feed.bytes(piece, fromPeer);
        marks.append(piece.size(), fromPeer ? '.' : '!');
        stream.remove_prefix(piece.size());
    }
    return marks;
}

void readFrames(std::string_view stream, unsigned seed, FrameReader::Side side) {
    Feed whole(side);
    whole.bytes(stream);
    Feed pieces(side);
    const std::string marks = feedPieces(pieces, stream, seed);
    fuzz::require(pieces.bodies == whole.bodies, "frames are the same however they arrive");
    fuzz::require(pieces.complaint == whole.complaint, "and so is what is malformed");
    std::string joined;
    for (std::size_t i = 0; i < pieces.bodies.size(); ++i) {
        const auto head = pieces.headers[i].bytes();
        const std::size_t begin = joined.size();
        joined.append(head.data(), head.size()).append(pieces.bodies[i]);
        const bool strange = marks.substr(begin, joined.size() - begin).contains('!');
        fuzz::require(pieces.fromPeer[i] != strange, "a frame is from the peer when all of it is");
    }
    fuzz::require(stream.starts_with(joined), "no byte is lost, added or changed");
}

} // namespace

void fuzz::run(std::string_view input) {
    if (input.empty())
        return;
    const auto seed = static_cast<unsigned char>(input.front());
    readFrames(input.substr(1), seed, FrameReader::Side::daemon);
    readFrames(input.substr(1), seed, FrameReader::Side::client);
}
