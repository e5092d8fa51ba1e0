// "add", "remove" and "bulk": which bundles the registry knows by their paths.
//
// To register a bundle is to read and hash its files and to write to the disk, and already finding
// out where a path leads may take long. So the handlers leave the service queue, and the paths are
// walked on the queue "registration", where requests take turns.

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/log/Log.h"
#include "platform/probe/Probes.h"
#include "zpd/Entitlements.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

void Transaction::addPlugIns() {
    processPaths(server().registrationQueue(), [this](const std::string& path, bool resolved) {
        return addPlugIn(path, resolved);
    });
}

// Any client may.
bool Transaction::addPlugIn(const std::string& path, bool resolved) {
    if (!resolved) {
        fail(ZPDErrorCode::badPath,
             ZPDErrorMakeFormat(ZPDErrorCode::badPath, "invalid plugin path: %@", path));
        return false;
    }
    platform::probe::pluginAdd(path.c_str());
    if (!server().addPlugIn(path))
        return true;
    ZPDLogOps().standard("failed to register plug-in at %@", path);
    fail(ZPDErrorCode::registration,
         ZPDErrorMakeFormat(ZPDErrorCode::registration, "unable to register plug-in at %@", path));
    return false;
}

// What the client may do is asked here, where that can be told, and only if the walk will come to
// use the answer.
void Transaction::removePlugIns() {
    const RemovalRight right{hasPathToWalk() && client().hasEntitlement(Entitlement::manager),
                             client().pid()};
    processPaths(server().registrationQueue(),
                 [this, right](const std::string& path, bool resolved) {
                     return removePlugIn(right, path, resolved);
                 });
}

bool Transaction::removePlugIn(const RemovalRight& right, const std::string& path, bool resolved) {
    platform::probe::pluginRemove(path.c_str(), resolved);
    if (!right.granted) {
        platform::log::defaultLog().standard("refused request from pid=%d to remove plug-in at %@ "
                                             "- client lacks required entitlement",
                                             right.pid, path);
        fail(ZPDErrorCode::notAuthorized, "caller lacks entitlement for this operation");
        return false;
    }
    if (!server().removePlugIn(path))
        return true;
    fail(ZPDErrorCode::badPath, ZPDErrorMakeFormat(ZPDErrorCode::badPath, "no plugin at %@", path));
    return false;
}

// False when the walk ends before its first path.
bool Transaction::hasPathToWalk() const {
    const platform::Array* const paths = request().findArray("paths");
    if (!paths || paths->empty())
        return false;
    const auto first = paths->begin()->string();
    return first && first->starts_with('/');
}

void Transaction::bulkPlugIns() {
    ZPDLogOps().info("bulk options 0x%lx not supported", unsignedFor("flags"));
    done();
}
