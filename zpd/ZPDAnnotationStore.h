#pragma once

#include <atomic>
#include <cstdint>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {
class Containers;
}

class ZPDPlugIn;

// The annotations of plug-ins that outlive the daemon, above all the user's elections: one
// property-list file, read once and written whole after every change (docs/annotation-store.md).
//
// Owned by the database and called only on its queue, where nothing else is said; no lock.
class ZPDAnnotationStore {
public:
    // Reads the store at `databasePath`, or at the usual place. Whatever is found there, the store
    // is usable afterwards.
    ZPDAnnotationStore(const std::optional<std::string>& databasePath,
                       platform::Containers& containers);

    [[nodiscard]] static std::string defaultDatabasePath();
    [[nodiscard]] static std::string globalPath();
    // The path that the system names in a configuration string (confstr(3), _CS_ constants).
    [[nodiscard]] static std::expected<std::string, platform::Error> confstrPath(int name);

    [[nodiscard]] const std::string& annotationsPath() const { return path_; }

    // A number that is another one after each change of what is stored. Any thread.
    [[nodiscard]] std::uint64_t changes() const noexcept { return changes_; }

    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForIdentifier(std::string_view key) const;
    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForPlugIn(const ZPDPlugIn& plugIn) const;
    // Adds the entries of `annotation` to what is stored for the plug-in, or takes all of that
    // away, and saves what changed.
    void setAnnotation(const std::optional<platform::Dictionary>& annotation,
                       const ZPDPlugIn& plugIn);

    // Takes over the annotations of a file. On failure nothing changes.
    [[nodiscard]] std::optional<platform::Error> loadDb(const std::string& path);
    [[nodiscard]] std::optional<platform::Error> saveDb();

private:
    // Where earlier versions kept the store.
    [[nodiscard]] std::expected<std::string, platform::Error> containerPath() const;
    void migrate();
    void prepareFolder(bool usualPlace) const;
    void add(std::string_view key, const platform::Dictionary& changes);
    void changed();

    platform::Containers& containers_;
    std::string path_;
    platform::Dictionary annotations_; // annotation key to annotation dictionary
    std::atomic<std::uint64_t> changes_ = 0;
    bool unsaved_ = false;
};
