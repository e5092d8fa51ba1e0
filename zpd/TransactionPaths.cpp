// The list of paths that requests about bundles carry.

#include <algorithm>
#include <chrono>
#include <utility>

#include "Zephrin/ZPDError.h"
#include "platform/file/File.h"
#include "platform/log/Render.h"
#include "platform/queue/SerialQueue.h"
#include "zpd/Transaction.h"

using platform::Value;

const platform::Array* Transaction::requestedPaths() {
    const Value* const value = request().find("paths");
    const platform::Array* const paths = value ? value->array() : nullptr;
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
    leaveOpen();
    queue.async([self = shared_from_this(), &queue, walk = std::move(block)]() mutable {
        self->processPathsFrom(0, queue, std::move(walk));
    });
}

void Transaction::processPathsFrom(std::size_t first, platform::SerialQueue& queue,
                                   PathBlock block) {
    const auto end = std::chrono::steady_clock::now() + longestTurn;
    const platform::Array* const paths = requestedPaths();
    if (!paths)
        return;
    for (std::size_t next = first; next < paths->size(); ++next) {
        if (next > first && std::chrono::steady_clock::now() >= end) {
            return queue.async(
                [self = shared_from_this(), next, &queue, walk = std::move(block)]() mutable {
                    self->processPathsFrom(next, queue, std::move(walk));
                });
        }
        if (!marshalPath((*paths)[next], block))
            return;
    }
    done();
}
