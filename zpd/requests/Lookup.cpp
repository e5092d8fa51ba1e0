// "find": one plug-in by its UUID or by the URL of its bundle, without any filter.

#include <utility>

#include "Zephrin/FileURL.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPDaemonClient.h"
#include "platform/file/File.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"

using platform::Value;

void Transaction::findPlugIn() {
    const ZPDPlugIn::Ptr plugIn = requestedPlugIn();
    if (!plugIn) {
        ZPDLogOps().standard("plugin not found");
        return fail(ZPDErrorCode::notFound, "Cannot locate PlugIn");
    }
    ZPDLogOps().standard("plugin found %{public}@", *plugIn);
    ZPDPlugIn::Current current = plugIn->current(server().annotationChanges());
    if (const auto encoded = encodedForm(*plugIn, std::move(current.replyForm)))
        setMatches(ZPDaemonClient::convertToIPC(*encoded, version()));
    done();
}

// When both keys are given the path has the last word, also when it leads nowhere.
ZPDPlugIn::Ptr Transaction::requestedPlugIn() const {
    if (const auto url = stringFor("paths"))
        return findPlugInByPathURL(*url);
    const Value* const value = request().find("uuids");
    const auto uuid = value ? value->uuid() : std::nullopt;
    return uuid ? findPlugInByUUID(*uuid) : nullptr;
}

ZPDPlugIn::Ptr Transaction::findPlugInByUUID(const platform::Uuid& uuid) const {
    return server().findPlugIn(uuid);
}

ZPDPlugIn::Ptr Transaction::findPlugInByPathURL(std::string_view url) const {
    const auto path = pathFromFileURL(url);
    return path ? findPlugInByPath(*path) : nullptr;
}

ZPDPlugIn::Ptr Transaction::findPlugInByPath(const std::string& path) const {
    const auto canonical = platform::canonicalPath(path);
    return server().findPlugInAtPath(canonical ? *canonical : path);
}
