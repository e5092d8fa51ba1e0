#pragma once

#include <string>
#include <string_view>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARFolder.h"
#include "platform/file/OwnershipTest.h"
#include "platform/paths/Places.h"

// Told of what a scanner comes upon, on the scanner's thread.
class ARScanSink {
public:
    virtual ~ARScanSink() = default;
    // A candidate in a trusted folder. Answers whether the scanner shall look for plug-ins in it.
    virtual bool found(const ARCandidate& candidate) = 0;
    // Something named like a bundle that does not count; why.
    virtual void refused(const std::string& path, const std::string& reason) = 0;
    // A folder whose content cannot be told now: nothing below it counts as gone.
    virtual void unreadable(const std::string& path, const std::string& reason) = 0;
};

// Walks the folders of applications, plug-ins and extension points, or goes to single bundles by
// path, and hands every candidate to its sink by its canonical path. Whatever is a symbolic link
// is followed first. Lives for one pass; sink and ownership test must outlive it.
class ARScanner {
public:
    ARScanner(ARScanSink& sink, platform::OwnershipTest& ownership)
        : sink_(sink), ownership_(ownership) {}

    void scan(const platform::Places& places);
    void scanFolder(ARKind kind, const std::string& folder);
    // True when scanning comes upon the plug-in with this canonical path, unless only links lead
    // there.
    [[nodiscard]] bool reaches(std::string_view plugInPath, const platform::Places& places) const;
    // One bundle, and the plug-ins in it.
    void scanBundle(ARKind kind, const std::string& path);

private:
    void scanEntries(ARKind kind, const ARFolder& folder);
    void scanEntry(ARKind kind, const ARFolder& folder, const ARFolder::Entry& entry);
    void offer(ARKind kind, const ARFolder& folder, std::string_view name);
    void scanPlugInsOf(const ARFolder& folder, std::string_view application);
    void complain(const std::string& path, int number);

    ARScanSink& sink_;
    platform::OwnershipTest& ownership_;
};

// How the names of one kind end.
[[nodiscard]] std::string_view ARSuffixOf(ARKind kind);
// The folder of an application's plug-ins, below the application.
inline constexpr std::string_view ARPlugInsFolder = "PlugIns";
// The application that a plug-in's canonical path lies in, by its form alone; empty when none.
[[nodiscard]] std::string_view ARApplicationPathOf(std::string_view plugInPath);
