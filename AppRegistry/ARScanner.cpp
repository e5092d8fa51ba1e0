#include "AppRegistry/ARScanner.h"

#include <algorithm>
#include <cerrno>
#include <system_error>

#include "platform/bundle/ExtensionPoints.h"
#include "platform/file/File.h"

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

std::string_view ARApplicationPathOf(std::string_view plugInPath) {
    const std::string_view plugIns = ARFolderOf(plugInPath);
    const std::string_view application = ARFolderOf(plugIns);
    const bool inside = ARNameOf(plugIns) == ARPlugInsFolder &&
                        ARIsNamed(ARNameOf(application), ARSuffixOf(ARKind::application));
    return inside ? application : std::string_view();
}

void ARScanner::scan(const platform::Places& places) {
    for (const std::string& folder : places.extensionPointFolders)
        scanFolder(ARKind::extensionPoint, folder);
    for (const std::string& folder : places.applicationFolders)
        scanFolder(ARKind::application, folder);
    for (const std::string& folder : places.plugInFolders)
        scanFolder(ARKind::plugIn, folder);
}

bool ARScanner::reaches(std::string_view plugInPath, const platform::Places& places) const {
    const std::string_view application = ARApplicationPathOf(plugInPath);
    const bool alone = application.empty();
    const std::string_view folder = ARFolderOf(alone ? plugInPath : application);
    return std::ranges::any_of(
        alone ? places.plugInFolders : places.applicationFolders,
        [&](const std::string& watched) { return platform::canonicalPath(watched) == folder; });
}

void ARScanner::scanFolder(ARKind kind, const std::string& folder) {
    const auto path = platform::canonicalPath(folder);
    if (!path) {
        complain(folder, path.error());
        return;
    }
    const auto opened = ARFolder::open(*path, ownership_);
    if (opened) {
        scanEntries(kind, *opened);
    } else {
        complain(*path, opened.error());
    }
}

void ARScanner::scanBundle(ARKind kind, const std::string& path) {
    const auto canonical = platform::canonicalPath(path);
    if (!canonical) {
        complain(path, canonical.error());
        return;
    }
    const std::string_view name = ARNameOf(*canonical);
    if (!ARIsNamed(name, ARSuffixOf(kind))) {
        sink_.refused(path, "it leads to what is not named like a bundle");
        return;
    }
    const auto folder = ARFolder::open(std::string(ARFolderOf(*canonical)), ownership_);
    if (folder) {
        offer(kind, *folder, name);
    } else {
        complain(*canonical, folder.error());
    }
}

void ARScanner::scanEntries(ARKind kind, const ARFolder& folder) {
    const auto entries = folder.entries(ARSuffixOf(kind));
    if (!entries) {
        complain(folder.path(), entries.error());
        return;
    }
    for (const ARFolder::Entry& entry : *entries)
        scanEntry(kind, folder, entry);
}

void ARScanner::scanEntry(ARKind kind, const ARFolder& folder, const ARFolder::Entry& entry) {
    if (entry.type == ARFolder::EntryType::link) {
        if (folder.refusal()) {
            sink_.refused(folder.pathOf(entry.name), *folder.refusal());
        } else {
            scanBundle(kind, folder.pathOf(entry.name));
        }
        return;
    }
    const bool wantsFolder = kind != ARKind::extensionPoint;
    if (wantsFolder == (entry.type == ARFolder::EntryType::folder))
        offer(kind, folder, entry.name);
}

void ARScanner::offer(ARKind kind, const ARFolder& folder, std::string_view name) {
    const std::string path = folder.pathOf(name);
    if (folder.refusal()) {
        sink_.refused(path, *folder.refusal());
        return;
    }
    const bool lookInside = sink_.found({kind, folder, name, path});
    if (lookInside && kind == ARKind::application)
        scanPlugInsOf(folder, name);
}

void ARScanner::scanPlugInsOf(const ARFolder& folder, std::string_view application) {
    std::string name(application);
    name += '/';
    name += ARPlugInsFolder;
    const auto plugIns = folder.openWithin(name);
    if (plugIns) {
        scanEntries(ARKind::plugIn, *plugIns);
    } else if (plugIns.error() == ELOOP || plugIns.error() == ENOTDIR) {
        scanFolder(ARKind::plugIn, folder.pathOf(name)); // a link, or not a folder at all
    } else {
        complain(folder.pathOf(name), plugIns.error());
    }
}

void ARScanner::complain(const std::string& path, int number) {
    if (number != ENOENT && number != ENOTDIR)
        sink_.unreadable(path, std::generic_category().message(number));
}
