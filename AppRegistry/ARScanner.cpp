#include "AppRegistry/ARScanner.h"

#include <algorithm>
#include <cerrno>
#include <system_error>

#include "AppRegistry/ARWatches.h"
#include "platform/bundle/ExtensionPoints.h"
#include "platform/file/File.h"

namespace {

constexpr const char* leadsToNoBundle = "it leads to what is not named like a bundle";

} // namespace

std::string_view ARSuffixOf(ARKind kind) {
    switch (kind) {
    case ARKind::application:
        return ".app";
    case ARKind::plugIn:
        return ".appex";
    case ARKind::extensionPoint:
        break;
    }
    return platform::extensionPointSuffix;
}

std::optional<ARKind> ARKindOfName(std::string_view name) {
    for (const ARKind kind : {ARKind::application, ARKind::plugIn, ARKind::extensionPoint}) {
        if (ARIsNamed(name, ARSuffixOf(kind)))
            return kind;
    }
    return std::nullopt;
}

std::string_view ARItemOf(std::string_view path) {
    const std::string_view application = ARApplicationPathOf(path);
    return application.empty() ? path : application;
}

std::string_view ARApplicationPathOf(std::string_view plugInPath) {
    const std::string_view plugIns = ARFolderOf(plugInPath);
    const std::string_view application = ARFolderOf(plugIns);
    const bool inside = ARNameOf(plugIns) == ARPlugInsFolder &&
                        ARIsNamed(ARNameOf(application), ARSuffixOf(ARKind::application));
    return inside ? application : std::string_view();
}

void ARScanner::scan(const platform::Places& places) {
    for (const std::string& folder : places.extensionPointFolders)
        scanRoot(ARKind::extensionPoint, folder);
    for (const std::string& folder : places.applicationFolders)
        scanRoot(ARKind::application, folder);
    for (const std::string& folder : places.plugInFolders)
        scanRoot(ARKind::plugIn, folder);
}

bool ARScanner::reaches(std::string_view plugInPath, const platform::Places& places) const {
    const std::string_view application = ARApplicationPathOf(plugInPath);
    const bool alone = application.empty();
    const std::string_view folder = ARFolderOf(alone ? plugInPath : application);
    return std::ranges::any_of(
        alone ? places.plugInFolders : places.applicationFolders,
        [&](const std::string& watched) { return platform::canonicalPath(watched) == folder; });
}

void ARScanner::scanRoot(ARKind kind, const std::string& folder) {
    watches_.watchWay(ARWatches::everything, folder);
    const auto path = platform::canonicalPath(folder);
    if (!path)
        return complain(folder, path.error());
    watches_.watchRoot(kind, *path);
    const auto opened = ARFolder::open(*path, ownership_);
    const auto entries =
        opened ? opened->entries(ARSuffixOf(kind)) : std::unexpected(opened.error());
    if (!entries)
        return complain(*path, entries.error());
    for (const ARFolder::Entry& entry : *entries)
        look(kind, *opened, entry.name, entry.type);
}

void ARScanner::scanItem(ARKind kind, const std::string& folder, const std::string& name) {
    auto known = opened_.find(folder);
    if (known == opened_.end()) {
        auto opened = ARFolder::open(folder, ownership_);
        if (!opened)
            return complain(folder, opened.error());
        known = opened_.emplace(folder, std::move(*opened)).first;
    }
    look(kind, known->second, name, known->second.typeOf(name));
}

void ARScanner::look(ARKind kind, const ARFolder& folder, const std::string& name,
                     std::optional<ARFolder::EntryType> type) {
    if (type == ARFolder::EntryType::link)
        return followLink(kind, folder, name);
    const auto wanted =
        kind == ARKind::extensionPoint ? ARFolder::EntryType::other : ARFolder::EntryType::folder;
    const std::string item = folder.pathOf(name);
    for (int attempt = 0; attempt < mostAttempts; ++attempt) {
        sink_.beginItem(item);
        if (type == wanted)
            offer(kind, folder, name, item);
        if (sink_.endItem())
            return;
        type = folder.typeOf(name);
    }
}

// What a link leads to is an item as well. It is looked at again with everything else.
void ARScanner::followLink(ARKind kind, const ARFolder& folder, const std::string& name) {
    const std::string link = folder.pathOf(name);
    if (folder.refusal())
        return sink_.refused(link, *folder.refusal());
    if (!sink_.foundLink(link))
        return;
    const auto path = platform::canonicalPath(link);
    if (!path)
        return complain(link, path.error());
    if (!ARIsNamed(ARNameOf(*path), ARSuffixOf(kind)))
        return sink_.refused(link, leadsToNoBundle);
    for (int attempt = 0; attempt < mostAttempts; ++attempt) {
        sink_.beginItem(*path);
        watches_.leadsAway(*path);
        scanBundle(kind, link, *path);
        if (sink_.endItem())
            return;
    }
}

void ARScanner::scanBundle(ARKind kind, const std::string& path, const std::string& item) {
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return complain(path, canonical.error());
    const std::string_view name = ARNameOf(*canonical);
    if (!ARIsNamed(name, ARSuffixOf(kind)))
        return sink_.refused(path, leadsToNoBundle);
    const auto folder = ARFolder::open(std::string(ARFolderOf(*canonical)), ownership_);
    if (!folder)
        return complain(*canonical, folder.error());
    offer(kind, *folder, name, item);
}

void ARScanner::offer(ARKind kind, const ARFolder& folder, std::string_view name,
                      const std::string& item) {
    const std::string path = folder.pathOf(name);
    if (folder.refusal())
        return sink_.refused(path, *folder.refusal());
    const bool lookInside = sink_.found({kind, folder, name, path, item});
    if (lookInside && kind == ARKind::application)
        scanPlugInsOf(folder, name, item);
}

void ARScanner::scanPlugInsOf(const ARFolder& folder, std::string_view application,
                              const std::string& item) {
    const std::string name = ARPathIn(application, ARPlugInsFolder);
    const std::string path = folder.pathOf(name);
    watches_.watchPlugIns(item, path);
    const auto plugIns = folder.openWithin(name);
    if (plugIns)
        return scanPlugIns(*plugIns, item);
    if (folder.typeOf(name) == ARFolder::EntryType::link)
        return scanPlugInsBehindLink(path);
    complain(path, plugIns.error());
}

void ARScanner::scanPlugInsBehindLink(const std::string& path) {
    if (!sink_.foundLink(path))
        return;
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return complain(path, canonical.error());
    watches_.watchPlugIns(ARWatches::everything, *canonical);
    const auto opened = ARFolder::open(*canonical, ownership_);
    if (!opened)
        return complain(*canonical, opened.error());
    scanPlugIns(*opened, ARWatches::everything);
}

void ARScanner::scanPlugIns(const ARFolder& folder, const std::string& item) {
    const auto entries = folder.entries(ARSuffixOf(ARKind::plugIn));
    if (!entries)
        return complain(folder.path(), entries.error());
    for (const ARFolder::Entry& entry : *entries) {
        const std::string path = folder.pathOf(entry.name);
        if (entry.type == ARFolder::EntryType::folder) {
            offer(ARKind::plugIn, folder, entry.name, item);
        } else if (entry.type == ARFolder::EntryType::link && folder.refusal()) {
            sink_.refused(path, *folder.refusal());
        } else if (entry.type == ARFolder::EntryType::link && sink_.foundLink(path)) {
            scanBundle(ARKind::plugIn, path, ARWatches::everything);
        }
    }
}

void ARScanner::complain(const std::string& path, int number) {
    if (number == ENOENT || number == ENOTDIR)
        return;
    if (number != EACCES && number != ELOOP)
        watches_.lookAgainLater();
    sink_.unreadable(path, std::generic_category().message(number));
}
