#pragma once

#include <atomic>
#include <cstddef>

// The requests that wait until it is known what their client may do: with the signing service,
// which calls back on a thread of its own. Owned by the server, which must not go before the last
// of them was called back. Any thread.
class ZPDPreparations {
public:
    // False when it is closed: then the request is let go.
    [[nodiscard]] bool begin();
    // The last that the caller has to do with the server.
    void end();
    // Lets no further one begin, and waits for those that did.
    void close();

private:
    std::atomic<std::size_t> underWay_ = 0;
    std::atomic<bool> closed_ = false;
};
