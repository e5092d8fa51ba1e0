#include "AppRegistry/ARIdentity.h"

#include <algorithm>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARFolder.h"
#include "AppRegistry/ARPointKeys.h"
#include "platform/bundle/ExtensionPoints.h"
#include "platform/bundle/Identifier.h"
#include "platform/bundle/InfoKeys.h"

using platform::Dictionary;
using platform::SharedBytes;
using platform::Value;

namespace {

std::optional<SharedBytes> textEntry(const Dictionary& info, const char* key) {
    const Value* value = info.find(key);
    const SharedBytes* text = value ? value->sharedString() : nullptr;
    return text ? std::optional(*text) : std::nullopt;
}

std::optional<SharedBytes> plugInIdentifier(const Dictionary& info) {
    if (const Dictionary* declaration = info.findDictionary(platform::InfoKey::extension)) {
        if (auto own = textEntry(*declaration, platform::InfoKey::extensionIdentifier))
            return own;
    }
    if (auto own = textEntry(info, platform::InfoKey::extensionIdentifier))
        return own;
    return textEntry(info, platform::InfoKey::bundleIdentifier);
}

std::optional<SharedBytes> identifierOf(ARKind kind, std::string_view path,
                                        const Dictionary& info) {
    switch (kind) {
    case ARKind::plugIn:
        return plugInIdentifier(info);
    case ARKind::application:
        return textEntry(info, platform::InfoKey::bundleIdentifier);
    case ARKind::extensionPoint:
        break;
    }
    std::string_view name = ARNameOf(path);
    name.remove_suffix(std::min(name.size(), platform::extensionPointSuffix.size()));
    return SharedBytes(name);
}

} // namespace

Dictionary ARReportedInfo(ARKind kind, Dictionary info) {
    if (kind != ARKind::plugIn || info.contains(platform::InfoKey::extensionPoint))
        return info;
    const Dictionary* declaration = info.findDictionary(platform::InfoKey::extension);
    const Value* point =
        declaration ? declaration->find(platform::InfoKey::extensionPoint) : nullptr;
    if (point)
        info.set(platform::InfoKey::extensionPoint, Value(*point));
    return info;
}

std::optional<std::string> ARIdentify(ARBundleRow& row, std::string_view path,
                                      const Dictionary& info) {
    const auto identifier = identifierOf(row.kind, path, info);
    if (!identifier && row.kind != ARKind::application)
        return "it has no identifier";
    if (identifier && !platform::isIdentifier(identifier->view()))
        return "its identifier is not one";
    row.identifier = identifier.value_or(SharedBytes());
    row.originalIdentifier = row.identifier;
    row.bundleIdentifier = textEntry(info, platform::InfoKey::bundleIdentifier);
    row.bundleVersion = textEntry(info, platform::InfoKey::bundleVersion);
    row.declaresTypes = info.contains(platform::InfoKey::typeDeclarations);
    const auto executable = textEntry(info, platform::InfoKey::executable);
    if (executable && ARIsExecutableName(executable->view()))
        row.executable = *executable;
    if (row.kind == ARKind::plugIn)
        row.points = ARPointKeysOf(info);
    return std::nullopt;
}
