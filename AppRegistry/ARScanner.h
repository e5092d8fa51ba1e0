#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARFolder.h"
#include "platform/file/OwnershipTest.h"
#include "platform/paths/Places.h"

class ARWatches;

// Told of what a scanner comes upon, on the scanner's thread.
class ARScanSink {
public:
    virtual ~ARScanSink() = default;
    // What follows belongs to one item, by its canonical path.
    virtual void beginItem(const std::string& item) = 0;
    // False when the item was another one in the end than at first, and is to be looked at again.
    [[nodiscard]] virtual bool endItem() = 0;
    // A candidate in a trusted folder. Answers whether the scanner shall look for plug-ins in it.
    virtual bool found(const ARCandidate& candidate) = 0;
    // A symbolic link. Answers whether the scanner shall follow it.
    virtual bool foundLink(const std::string& path) = 0;
    // Something named like a bundle that does not count; why.
    virtual void refused(const std::string& path, const std::string& reason) = 0;
    // A folder whose content cannot be told now: nothing below it counts as gone.
    virtual void unreadable(const std::string& path, const std::string& reason) = 0;
};

// Walks the folders of applications, plug-ins and extension points, or goes to single items and
// bundles, and hands every candidate to its sink by its canonical path. Whatever is a symbolic link
// is followed first. Each folder is watched before it is read. Lives for one pass; sink, ownership
// test and watches must outlive it.
class ARScanner {
public:
    // How often an item that is exchanged while it is read is read again at once.
    static constexpr int mostAttempts = 3;

    ARScanner(ARScanSink& sink, platform::OwnershipTest& ownership, ARWatches& watches)
        : sink_(sink), ownership_(ownership), watches_(watches) {}

    void scan(const platform::Places& places);
    // What lies under a name in one of the folders that `scan` walks.
    void scanItem(ARKind kind, const std::string& folder, const std::string& name);
    // True when scanning comes upon the plug-in with this canonical path, unless only links lead
    // there.
    [[nodiscard]] bool reaches(std::string_view plugInPath, const platform::Places& places) const;
    // One bundle, and the plug-ins in it. `item` is what its watches belong to.
    void scanBundle(ARKind kind, const std::string& path, const std::string& item);

private:
    void scanRoot(ARKind kind, const std::string& folder);
    void look(ARKind kind, const ARFolder& folder, const std::string& name,
              std::optional<ARFolder::EntryType> type);
    void followLink(ARKind kind, const ARFolder& folder, const std::string& name);
    void scanPlugIns(const ARFolder& folder, const std::string& item);
    void scanPlugInsOf(const ARFolder& folder, std::string_view application,
                       const std::string& item);
    void scanPlugInsBehindLink(const std::string& path);
    void offer(ARKind kind, const ARFolder& folder, std::string_view name, const std::string& item);
    void complain(const std::string& path, int number);

    ARScanSink& sink_;
    platform::OwnershipTest& ownership_;
    ARWatches& watches_;
    std::map<std::string, ARFolder, std::less<>> opened_; // of single items
};

// How the names of one kind end.
[[nodiscard]] std::string_view ARSuffixOf(ARKind kind);
// What something would be, by the end of its name.
[[nodiscard]] std::optional<ARKind> ARKindOfName(std::string_view name);
// The folder of an application's plug-ins, below the application.
inline constexpr std::string_view ARPlugInsFolder = "PlugIns";
// The application that a plug-in's canonical path lies in, by its form alone; empty when none.
[[nodiscard]] std::string_view ARApplicationPathOf(std::string_view plugInPath);
// The item that a bundle belongs to: the application that it lies in, else it is one itself.
[[nodiscard]] std::string_view ARItemOf(std::string_view path);
