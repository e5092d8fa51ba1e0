#pragma once

#include <cstdint>
#include <expected>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "AppRegistry/ARBundleRow.h"
#include "AppRegistry/ARPlugInUsers.h"
#include "AppRegistry/ARSignature.h"
#include "platform/file/File.h"
#include "platform/value/Error.h"

// A new entry with all that is stored of it.
struct ARNewEntry {
    ARBundleRow row;
    ARDigests digests{};
    std::string info; // its info dictionary, encoded
};

// Changes that are stored together or not at all.
struct ARStoreChanges {
    std::vector<ARNewEntry> added;
    // Entries whose files moved without a change of content, or whose presence or placeholder
    // state changed.
    std::vector<ARBundleRow> updated;
    std::vector<std::int64_t> removed;
    // Signatures of entries that are added, or whose files were read again.
    std::vector<ARSignatureOfEntry> signatures;
    // What came out when signatures that are stored were judged again; their content stays.
    std::vector<ARSignatureOfEntry> judgedAgain;
    std::vector<ARPlugInUser> users; // that were given
    ARKnowledge knowledge;           // after the change

    [[nodiscard]] bool empty() const {
        return added.empty() && updated.empty() && removed.empty() && signatures.empty() &&
               judgedAgain.empty() && users.empty();
    }
};

// What a commit that has returned has withstood: the end of the process, or also that of the box.
enum class ARDurability : std::uint8_t { process, box };

// Why a database could not be used. Damage (also a database of another version) is healed by
// setting it aside; anything else is not the database's fault.
struct ARStoreFailure {
    bool damaged = false;
    std::string reason;
};

// The registry's database: what the registry learnt about the bundles, in SQLite. Nothing in it
// is the only copy of what the folders tell, so that it may be thrown away at any time.
// Owned by the registry. One thread at a time, except info() and signature(), which any thread may
// call at any time: they have a connection of their own that no writer keeps waiting.
class ARStore {
public:
    struct Content {
        std::vector<ARBundleRow> rows; // in order of registration
        std::vector<ARPlugInUser> users;
        ARKnowledge knowledge;
        bool complete = false; // see markComplete
    };

    // Opens or makes the database, checks that it is whole, and prepares everything.
    [[nodiscard]] static std::expected<std::unique_ptr<ARStore>, ARStoreFailure>
    open(const std::string& path);
    ~ARStore();

    [[nodiscard]] std::expected<Content, ARStoreFailure> load();
    // All of them, in this order, or none.
    [[nodiscard]] std::optional<platform::Error> commit(std::span<const ARStoreChanges> changes,
                                                        ARDurability durability);
    // Everything is in it that the folders and the file beside it tell: a pass over a new database
    // came to its end.
    [[nodiscard]] std::optional<platform::Error> markComplete();
    // What the files of an entry hashed to when they were read.
    [[nodiscard]] std::optional<ARDigests> digests(std::int64_t id);
    // Brings what was committed from the log into the database file. From here on that is done
    // whenever the log became long.
    void checkpoint();

    // The encoded info dictionary of an entry; nothing when it is gone or cannot be read.
    [[nodiscard]] std::optional<std::string> info(std::int64_t id) const;
    // The signature of an entry; nothing when it has none, is gone or cannot be read.
    [[nodiscard]] std::optional<ARSignatureFacts> signature(std::int64_t id) const;

    // From here on both answer as of now, whatever is committed: what readers still see can be
    // looked up until they see what came instead. That is what `show` does; while it runs nobody
    // looks anything up, and afterwards what was committed is found. By turns, on the writer's
    // thread.
    void holdReaders();
    void releaseReaders(const std::function<void()>& show);

private:
    struct Impl;
    explicit ARStore(std::unique_ptr<Impl> impl);

    std::unique_ptr<Impl> impl_;
};

// A file that belongs to a database: of the same name, with another suffix.
[[nodiscard]] std::string ARFileBeside(std::string_view database, std::string_view suffix);

// The path under which a damaged database is kept for a look; an earlier one is replaced.
[[nodiscard]] std::string ARDamagedStorePath(const std::string& path);

struct AROpenedStore {
    std::string path;
    platform::UniqueFd lock; // keeps other daemons away for as long as it lives
    std::unique_ptr<ARStore> store;
    ARStore::Content content;
};

// Opens the database and reads it. A damaged one is set aside with one log line, and an empty one
// takes its place. One that another daemon uses is left alone, and one beside it taken instead.
[[nodiscard]] std::expected<AROpenedStore, platform::Error>
AROpenStore(const std::string& usualPath);
