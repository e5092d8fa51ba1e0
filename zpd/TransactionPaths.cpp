// The list of paths that requests about bundles carry.

#include <algorithm>
#include <chrono>
#include <utility>

#include "Zephrin/ZPDError.h"
#include "platform/file/File.h"
#include "platform/log/Render.h"
#include "platform/queue/SerialQueue.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

using platform::Value;

const platform::Array* Transaction::requestedPaths() {
    const platform::Array* const paths = request().findArray("paths");
    if (!paths)
        fail(ZPDErrorCode::invalidRequest, "invalid request format");
    return paths;
}

bool Transaction::marshalPaths(const PathBlock& block) {
    const platform::Array* const paths = requestedPaths();
    return paths &&
           std::ranges::all_of(*paths, [&](const Value& path) { return marshalPath(path, block); });
}

bool Transaction::marshalPath(const Value& entry, const PathBlock& block) {
    const auto path = entry.string();
    if (!path) {
        fail(ZPDErrorCode::invalidRequest, "invalid request format");
        return false;
    }
    if (!path->starts_with('/')) {
        fail(ZPDErrorCode::badPath,
             ZPDErrorMakeFormat(ZPDErrorCode::badPath, "absolute path required: %s", *path));
        return false;
    }
    const auto resolved = platform::canonicalPath(*path);
    return resolved ? block(*resolved, true) : block(std::string(*path), false);
}

void Transaction::processPaths(platform::SerialQueue& queue, PathBlock block) {
    walkRequestedPaths(queue, std::move(block), [this] { done(); });
}

void Transaction::walkPaths(platform::SerialQueue& queue, PathBlock block,
                            std::function<void()> whole) {
    walkRequestedPaths(queue, std::move(block),
                       [this, whole = std::move(whole)] { comeBack(whole); });
}

void Transaction::walkRequestedPaths(platform::SerialQueue& queue, PathBlock block,
                                     std::function<void()> whole) {
    const platform::Array* const paths = requestedPaths();
    if (!paths)
        return;
    leaveOpen();
    const auto step = [this, paths, block = std::move(block)](std::size_t index) {
        return marshalPath((*paths)[index], block);
    };
    const auto finish = [whole = std::move(whole)](bool isWhole) {
        if (isWhole)
            whole();
    };
    takeTurns(queue, 0, {paths->size(), step, finish});
}

void Transaction::comeBack(std::function<void()> part) {
    server().submitWork([self = shared_from_this(), part = std::move(part)] {
        self->client().attend(*self, part);
    });
}

void Transaction::takeTurns(platform::SerialQueue& queue, std::size_t first, Walk walk) {
    queue.async([self = shared_from_this(), &queue, first, walk = std::move(walk)]() mutable {
        const auto end = std::chrono::steady_clock::now() + longestTurn;
        for (std::size_t next = first; next < walk.count; ++next) {
            if (next > first && std::chrono::steady_clock::now() >= end)
                return self->takeTurns(queue, next, std::move(walk));
            if (!walk.step(next))
                return walk.finish(false);
        }
        walk.finish(true);
    });
}
