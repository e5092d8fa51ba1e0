// The list of paths that requests about bundles carry.

#include "Zephrin/ZPDError.h"
#include "platform/file/File.h"
#include "platform/log/Render.h"
#include "zpd/Transaction.h"

using platform::Value;

bool Transaction::marshalPaths(const PathBlock& block) {
    const Value* const value = request().find("paths");
    const platform::Array* const paths = value ? value->array() : nullptr;
    if (!paths) {
        fail(ZPDErrorCode::invalidRequest, "invalid request format");
        return false;
    }
    for (const Value& path : *paths) {
        if (!marshalPath(path, block))
            return false;
    }
    return true;
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

bool Transaction::processPaths(const PathBlock& block) {
    if (!marshalPaths(block))
        return false;
    done();
    return true;
}
