#pragma once

#include <mutex>

#include "AppRegistry/ARSql.h"
#include "AppRegistry/ARStore.h"

// Commits in the log need no sync to be whole after a crash. A synced one brings those before it to
// the disk as well.
inline constexpr const char* ARUnsyncedCommits = "PRAGMA synchronous = NORMAL";
inline constexpr const char* ARSyncedCommits = "PRAGMA synchronous = FULL";

// In the header of a database that is complete, where it is told that it is this system's ("zprc").
inline constexpr std::int64_t ARCompleteMark = 0x7a707263;

// The database's connections and statements, for the sources of ARStore alone. Statements are
// declared after the connection that they belong to, so that they go first.
struct ARStore::Impl {
    Impl(ARSqlConnection writing, ARSqlConnection reading);

    // SQLITE_OK when all statements could be prepared.
    [[nodiscard]] int prepared() const;

    // Parts of one transaction. Each gives SQLite's result code.
    [[nodiscard]] int write(std::span<const ARStoreChanges> changes);
    [[nodiscard]] int write(const ARStoreChanges& changes);
    [[nodiscard]] int insert(const ARNewEntry& entry);
    [[nodiscard]] int update(const ARBundleRow& row);
    [[nodiscard]] int remove(std::int64_t id);
    [[nodiscard]] int writeSignatures(const ARStoreChanges& changes);
    [[nodiscard]] int writeUsers(std::span<const ARPlugInUser> users);
    [[nodiscard]] int setTo(const ARKnowledge& known);

    // Brings a log that became long into the database file, so that the next commit begins it
    // anew. Not while readers are held: what came after them would stay in the log for ever.
    void shortenLog();

    ARSqlConnection writer;
    ARSqlStatement begin;
    ARSqlStatement end;
    ARSqlStatement rollback;
    ARSqlStatement insertEntry;
    ARSqlStatement insertDetail;
    ARSqlStatement updateEntry;
    ARSqlStatement removeEntry;
    ARSqlStatement removeDetail;
    ARSqlStatement putSignature;
    ARSqlStatement updateSignature;
    ARSqlStatement removeSignature;
    ARSqlStatement putUser;
    ARSqlStatement setKnowledge;
    ARSqlStatement selectDigests;
    int logPages = 0;         // after the last commit
    bool mayShorten = false;  // since the first checkpoint
    bool readersHeld = false; // by the writer's thread

    std::mutex readerLock; // held for one look-up at a time, never by a writer
    ARSqlConnection reader;
    ARSqlStatement selectInfo;
    ARSqlStatement selectSignature;
};
