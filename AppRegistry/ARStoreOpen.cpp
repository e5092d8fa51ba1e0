#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARStoreImpl.h"
#include "AppRegistry/ARStoreRow.h"
#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"

// Opening, checking, reading and setting aside the registry's database.

namespace {

// Raised with every change of the tables. An older database is upgraded, a newer one rebuilt.
constexpr std::int64_t schemaVersion = 3;
constexpr int waitForOtherProcessMilliseconds = 5000;
constexpr ::mode_t lockMode = 0600;
constexpr int mostDaemons = 8; // on one home at a time

constexpr const char* version1 =
    "BEGIN;"
    "CREATE TABLE entries (id INTEGER PRIMARY KEY, kind INTEGER NOT NULL, presence INTEGER NOT "
    "NULL,"
    " placeholder INTEGER NOT NULL, types INTEGER NOT NULL, uuid BLOB NOT NULL, path BLOB NOT NULL,"
    " identifier BLOB NOT NULL, original BLOB NOT NULL, bundle BLOB, version BLOB,"
    " executable BLOB NOT NULL, registered REAL NOT NULL, stamps BLOB NOT NULL,"
    " points BLOB NOT NULL);"
    // Apart from the entries, which a start reads all, without these.
    "CREATE TABLE details (id INTEGER PRIMARY KEY, digests BLOB NOT NULL, info BLOB NOT NULL);"
    "CREATE TABLE knowledge (id INTEGER PRIMARY KEY, sequence INTEGER NOT NULL, uuid BLOB);"
    "INSERT INTO knowledge VALUES (1, 0, NULL);"
    "PRAGMA user_version = 1;"
    "COMMIT;";
// A plug-in that has a signature file (the last of the three stamps has an inode) gets a stamp for
// it that proves nothing, so that the next pass reads it again.
constexpr const char* version2 =
    "BEGIN;"
    "CREATE TABLE signatures (id INTEGER PRIMARY KEY, key BLOB NOT NULL,"
    " entitlements BLOB NOT NULL, content BLOB NOT NULL);"
    "UPDATE entries SET stamps = CAST(substr(stamps, 1, 64) || zeroblob(8) AS BLOB)"
    " WHERE kind = 1 AND length(stamps) = 72 AND substr(stamps, 49, 8) <> zeroblob(8);"
    "PRAGMA user_version = 2;"
    "COMMIT;";
constexpr const char* version3 =
    "BEGIN;"
    "CREATE TABLE users (identifier BLOB PRIMARY KEY, user INTEGER NOT NULL UNIQUE);"
    "PRAGMA user_version = 3;"
    "COMMIT;";
constexpr const char* upgrades[schemaVersion] = {version1, version2,
                                                 version3}; // each from the one before

// The first checkpoint is made by the registry, once it has looked at everything.
constexpr const char* writerSettings =
    "PRAGMA page_size = 8192; PRAGMA journal_mode = WAL; PRAGMA synchronous = NORMAL;"
    "PRAGMA wal_autocheckpoint = 0; PRAGMA journal_size_limit = 1048576;";
constexpr const char* readerSettings = "PRAGMA cache_size = -64; PRAGMA query_only = 1;";

constexpr int openFlags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_PRIVATECACHE;

// What a database made of any bytes may answer counts as damage; only what the box itself is short
// of does not.
bool isDamage(int code) {
    switch (code & 0xff) { // without the extension
    case SQLITE_AUTH:
    case SQLITE_BUSY:
    case SQLITE_CANTOPEN:
    case SQLITE_FULL:
    case SQLITE_LOCKED:
    case SQLITE_NOMEM:
    case SQLITE_PERM:
    case SQLITE_READONLY:
        return false;
    default:
        return true;
    }
}

ARStoreFailure failure(int code) {
    return {isDamage(code), sqlite3_errstr(code)};
}

std::expected<std::int64_t, int> firstNumber(ARSqlConnection& connection, const char* sql) {
    ARSqlStatement statement(connection, sql);
    if (statement.prepared() != SQLITE_OK)
        return std::unexpected(statement.prepared());
    const int code = statement.step();
    if (code != SQLITE_ROW)
        return std::unexpected(code == SQLITE_DONE ? SQLITE_CORRUPT : code);
    return statement.integer(0);
}

std::optional<ARStoreFailure> checkWhole(ARSqlConnection& connection) {
    ARSqlStatement check(connection, "PRAGMA quick_check(1)");
    const int code = check.step();
    if (code != SQLITE_ROW)
        return failure(code);
    if (check.bytes(0) != "ok")
        return ARStoreFailure{true, std::string(check.bytes(0))};
    return std::nullopt;
}

// Makes the tables of a new database and upgrades those of an older one; refuses one of an unknown
// version or with damage.
std::optional<ARStoreFailure> makeUsable(ARSqlConnection& connection) {
    const auto version = firstNumber(connection, "PRAGMA user_version");
    const auto tables = firstNumber(connection, "SELECT count(*) FROM sqlite_schema");
    if (!version || !tables)
        return failure(version ? tables.error() : version.error());
    const bool isNew = *tables == 0 && *version == 0;
    if (!isNew && (*version < 1 || *version > schemaVersion))
        return ARStoreFailure{true, "its version is " + std::to_string(*version)};
    if (auto damage = checkWhole(connection))
        return damage;
    for (std::int64_t reached = *version; reached < schemaVersion; ++reached) {
        if (const int code = connection.execute(upgrades[reached]); code != SQLITE_OK)
            return failure(code);
    }
    return std::nullopt;
}

std::expected<ARSqlConnection, int> connect(const std::string& path, int flags,
                                            const char* settings) {
    auto connection = ARSqlConnection::open(path, flags);
    if (!connection)
        return connection;
    sqlite3_busy_timeout(connection->handle(), waitForOtherProcessMilliseconds);
    if (const int code = connection->execute(settings); code != SQLITE_OK)
        return std::unexpected(code);
    return connection;
}

std::optional<std::string> setAside(const std::string& path) {
    const std::string kept = ARDamagedStorePath(path);
    ::unlink((kept + "-wal").c_str());
    if (std::rename(path.c_str(), kept.c_str()) != 0)
        return "cannot rename it: " + describe(platform::posixError(errno, kept));
    std::rename((path + "-wal").c_str(), (kept + "-wal").c_str());
    ::unlink((path + "-shm").c_str());
    return std::nullopt;
}

// What stands in the database is believed, entitlements above all: nobody else may have written it.
std::optional<std::string> writableByOthers(const std::string& path) {
    platform::OwnershipTest ownership;
    for (const std::string& part : {platform::folderOf(path), path, path + "-wal"}) {
        const auto canonical = platform::canonicalPath(part);
        auto refusal = canonical ? ownership.refusal(*canonical) : std::nullopt;
        if (refusal)
            return refusal;
    }
    return std::nullopt;
}

struct LockedPath {
    std::string path;
    platform::UniqueFd lock;
};

// For as long as the answer lives no other daemon opens the database at this path. Only who may
// write it can hold the lock. Nothing when another one has it.
std::expected<std::optional<LockedPath>, platform::Error> lockAt(const std::string& path) {
    const std::string lockPath = ARFileBeside(path, ".lock");
    platform::UniqueFd lock(
        ::open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, lockMode));
    if (!lock)
        return std::unexpected(platform::posixError(errno, "open " + lockPath));
    if (::flock(lock.get(), LOCK_EX | LOCK_NB) == 0)
        return LockedPath{path, std::move(lock)};
    if (errno == EWOULDBLOCK)
        return std::nullopt;
    return std::unexpected(platform::posixError(errno, "lock " + lockPath));
}

// Each daemon goes by its own memory of what it changes, so that each has a database to itself:
// one that comes second, to serve another name, has another one.
std::expected<LockedPath, platform::Error> lockFor(const std::string& path) {
    for (int number = 1; number <= mostDaemons; ++number) {
        const std::string suffix = "-" + std::to_string(number) + ".db";
        auto locked = lockAt(number == 1 ? path : ARFileBeside(path, suffix));
        if (!locked)
            return std::unexpected(std::move(locked).error());
        if (!*locked)
            continue;
        if (number > 1)
            ARLog().standard("another daemon uses %{public}@: going by %{public}@", path,
                             (*locked)->path);
        return std::move(**locked);
    }
    return std::unexpected(platform::posixError(EWOULDBLOCK, "too many daemons use " + path));
}

using OpenedStore = std::pair<std::unique_ptr<ARStore>, ARStore::Content>;

std::expected<OpenedStore, ARStoreFailure> openAndLoad(const std::string& path) {
    auto store = ARStore::open(path);
    if (!store)
        return std::unexpected(store.error());
    auto content = (*store)->load();
    if (!content)
        return std::unexpected(content.error());
    return OpenedStore(std::move(*store), std::move(*content));
}

std::expected<OpenedStore, ARStoreFailure> openExisting(const std::string& path) {
    if (auto refusal = writableByOthers(path))
        return std::unexpected(ARStoreFailure{true, std::move(*refusal)});
    return openAndLoad(path);
}

} // namespace

std::expected<std::unique_ptr<ARStore>, ARStoreFailure> ARStore::open(const std::string& path) {
    auto writer = connect(path, openFlags | SQLITE_OPEN_CREATE, writerSettings);
    if (!writer)
        return std::unexpected(failure(writer.error()));
    if (auto trouble = makeUsable(*writer))
        return std::unexpected(std::move(*trouble));
    auto reader = connect(path, openFlags, readerSettings);
    if (!reader)
        return std::unexpected(failure(reader.error()));
    auto impl = std::make_unique<Impl>(std::move(*writer), std::move(*reader));
    if (const int code = impl->prepared(); code != SQLITE_OK)
        return std::unexpected(failure(code));
    return std::unique_ptr<ARStore>(new ARStore(std::move(impl)));
}

std::expected<ARStore::Content, ARStoreFailure> ARStore::load() {
    Content content;
    ARSqlStatement rows(impl_->writer, ARSelectRows);
    int code = rows.prepared();
    while (code == SQLITE_OK && (code = rows.step()) == SQLITE_ROW) {
        auto row = ARReadRow(rows);
        if (!row)
            return std::unexpected(ARStoreFailure{true, "an entry makes no sense"});
        content.rows.push_back(std::move(*row));
        code = SQLITE_OK;
    }
    if (code != SQLITE_DONE)
        return std::unexpected(failure(code));
    ARSqlStatement users(impl_->writer, "SELECT identifier, user FROM users");
    while ((code = users.step()) == SQLITE_ROW)
        content.users.emplace_back(users.bytes(0), static_cast<uid_t>(users.integer(1)));
    if (code != SQLITE_DONE)
        return std::unexpected(failure(code));
    const auto mark = firstNumber(impl_->writer, "PRAGMA application_id");
    content.complete = mark && *mark == ARCompleteMark;
    ARSqlStatement known(impl_->writer, "SELECT sequence, uuid FROM knowledge WHERE id = 1");
    if (known.step() != SQLITE_ROW)
        return std::unexpected(ARStoreFailure{true, "its state is missing"});
    content.knowledge.sequence = static_cast<std::uint64_t>(known.integer(0));
    if (!known.isNull(1))
        content.knowledge.uuid =
            platform::Uuid::fromBytes(std::as_bytes(std::span(known.bytes(1))));
    return content;
}

std::string ARFileBeside(std::string_view database, std::string_view suffix) {
    constexpr std::string_view own = ".db";
    if (database.ends_with(own))
        database.remove_suffix(own.size());
    return std::string(database) += suffix;
}

std::string ARDamagedStorePath(const std::string& path) {
    return path + ".damaged";
}

std::expected<AROpenedStore, platform::Error> AROpenStore(const std::string& usualPath) {
    if (auto error = platform::makeFolders(platform::folderOf(usualPath), 0755))
        return std::unexpected(std::move(*error));
    auto locked = lockFor(usualPath);
    if (!locked)
        return std::unexpected(std::move(locked).error());
    const std::string& path = locked->path;
    auto opened = ::access(path.c_str(), F_OK) == 0 ? openExisting(path) : openAndLoad(path);
    if (!opened && opened.error().damaged) {
        const std::string reason = opened.error().reason;
        if (const auto trouble = setAside(path)) {
            return std::unexpected(platform::Error{&platform::fileErrorDomain,
                                                   platform::fileErrorWriteUnknown,
                                                   path + " is damaged; " + *trouble});
        }
        ARLog().error("the registry database %{public}@ is damaged (%{public}@): kept as "
                      "%{public}@ and rebuilt",
                      path, reason, ARDamagedStorePath(path));
        opened = openAndLoad(path);
    }
    if (!opened) {
        return std::unexpected(platform::Error{&platform::fileErrorDomain,
                                               platform::fileErrorReadUnknown,
                                               path + ": " + opened.error().reason});
    }
    return AROpenedStore{std::move(locked->path), std::move(locked->lock), std::move(opened->first),
                         std::move(opened->second)};
}
