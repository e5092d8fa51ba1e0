#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <expected>
#include <optional>
#include <string>
#include <string_view>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/Frame.h"
#include "platform/value/Error.h"
#include "platform/value/Value.h"

namespace platform {
class Containers;
}

class ZPDPlugIn;

// The annotations of plug-ins that outlive the daemon, above all the user's elections: one
// property-list file, read once and written whole after changes (docs/annotation-store.md). They
// change here in memory only; ZPDAnnotationSaver brings them to disk.
//
// Owned by the database and called only on its queue, where nothing else is said; no lock.
class ZPDAnnotationStore {
public:
    static constexpr std::size_t largestAnnotation = 64U << 10; // bytes, encoded for the wire
    static constexpr std::size_t mostTogether = 16U << 20;      // bytes; their keys count, too
    // All together: small values take many times their encoding in memory and in the file.
    static constexpr std::size_t mostValues = platform::ipc::mostRequestValues;
    // Levels of an annotation; in a reply it stands in a form, and that in an array.
    static constexpr std::size_t deepestAnnotation = platform::ipc::deepestNesting - 2;

    // Reads the store at `databasePath`, or at the usual place. Whatever is found there, the store
    // is usable afterwards.
    ZPDAnnotationStore(const std::optional<std::string>& databasePath,
                       platform::Containers& containers);

    [[nodiscard]] static std::string defaultDatabasePath();
    [[nodiscard]] static std::string globalPath();
    // The path that the system names in a configuration string (confstr(3), _CS_ constants).
    [[nodiscard]] static std::expected<std::string, platform::Error> confstrPath(int name);

    [[nodiscard]] const std::string& annotationsPath() const { return path_; }

    // Grows with each change of what is stored. Any thread.
    [[nodiscard]] std::uint64_t changes() const noexcept { return changes_; }

    // All annotations, and the number of the last change that is in them.
    struct Snapshot {
        platform::Dictionary annotations;
        std::uint64_t change = 0;
    };

    // Later changes leave it alone, so that it may be read on any thread.
    [[nodiscard]] Snapshot snapshot();

    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForIdentifier(std::string_view key) const;
    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForPlugIn(const ZPDPlugIn& plugIn) const;
    // Adds the entries of `annotation` to what is stored for the plug-in, or takes all of that
    // away. An error, and no change, when the plug-in's or all annotations would grow too large.
    std::optional<platform::Error>
    setAnnotation(const std::optional<platform::Dictionary>& annotation, const ZPDPlugIn& plugIn);

    // Whether an annotation, taken by itself, would come back from the file and out of a reply as
    // it is: of kinds that property lists have, not too large and not too deep. Any thread.
    [[nodiscard]] static bool canHold(const platform::Dictionary& annotation);

    // Takes over the annotations of a file. On failure nothing changes.
    [[nodiscard]] std::optional<platform::Error> loadDb(const std::string& path);
    // Writes annotations to a file, and answers when they are on disk. Any thread.
    [[nodiscard]] static std::optional<platform::Error>
    saveDb(const std::string& path, const platform::Dictionary& annotations);

private:
    // What annotations take of the room that there is for all of them, keys included.
    struct Extent {
        std::size_t bytes = 0; // encoded
        std::size_t values = 0;

        Extent& operator+=(const Extent& other) {
            bytes += other.bytes;
            values += other.values;
            return *this;
        }

        Extent& operator-=(const Extent& other) {
            bytes -= other.bytes;
            values -= other.values;
            return *this;
        }
    };

    [[nodiscard]] static Extent extentOf(std::string_view key,
                                         const platform::Dictionary& annotation);
    // Where earlier versions kept the store.
    [[nodiscard]] std::expected<std::string, platform::Error> containerPath() const;
    void migrate();
    void prepareFolder(bool usualPlace) const;
    [[nodiscard]] std::optional<platform::Error> add(std::string_view key,
                                                     const platform::Dictionary& changes);
    void remove(std::string_view key);

    platform::Containers& containers_;
    std::string path_;
    platform::Dictionary annotations_; // annotation key to annotation dictionary
    platform::Dictionary handedOut_;   // the last snapshot: keeps it from being changed in place
    Extent extent_;                    // of all of them
    std::atomic<std::uint64_t> changes_ = 0;
};
