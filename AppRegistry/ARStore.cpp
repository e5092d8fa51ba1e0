#include "AppRegistry/ARStore.h"

#include <cstring>

#include "AppRegistry/ARStoreImpl.h"
#include "AppRegistry/ARStoreRow.h"

namespace {

const platform::ErrorDomain databaseErrorDomain{"SQLite"}; // codes are SQLite's

constexpr int longLog = 256; // pages

constexpr const char* insertEntrySql =
    "INSERT INTO entries (id, kind, presence, placeholder, types, uuid, path, identifier, original,"
    " bundle, version, executable, registered, stamps, points)"
    " VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15)";
constexpr const char* updateEntrySql =
    "UPDATE entries SET presence = ?2, placeholder = ?3, stamps = ?4 WHERE id = ?1";
constexpr const char* selectSignatureSql =
    "SELECT s.content, s.key, s.entitlements, d.digests FROM signatures s"
    " JOIN details d ON d.id = s.id WHERE s.id = ?1";

std::optional<std::string_view> view(const std::optional<platform::SharedBytes>& text) {
    return text ? std::optional(text->view()) : std::nullopt;
}

std::optional<ARDigests> digestsIn(std::string_view bytes) {
    if (bytes.size() != sizeof(ARDigests))
        return std::nullopt;
    ARDigests digests;
    std::memcpy(&digests, bytes.data(), sizeof digests);
    return digests;
}

template <class E>
std::int64_t number(E e) {
    return static_cast<std::int64_t>(e);
}

int noteLogPages(void* logPages, sqlite3*, const char*, int pages) {
    *static_cast<int*>(logPages) = pages;
    return SQLITE_OK;
}

std::optional<platform::Error> errorOf(int code) {
    if (code == SQLITE_OK)
        return std::nullopt;
    return platform::Error{&databaseErrorDomain, code, sqlite3_errstr(code)};
}

} // namespace

ARStore::Impl::Impl(ARSqlConnection writing, ARSqlConnection reading)
    : writer(std::move(writing)),
      begin(writer, "BEGIN IMMEDIATE"),
      end(writer, "COMMIT"),
      rollback(writer, "ROLLBACK"),
      insertEntry(writer, insertEntrySql),
      insertDetail(writer, "INSERT INTO details (id, digests, info) VALUES (?1, ?2, ?3)"),
      updateEntry(writer, updateEntrySql),
      removeEntry(writer, "DELETE FROM entries WHERE id = ?1"),
      removeDetail(writer, "DELETE FROM details WHERE id = ?1"),
      putSignature(writer, "INSERT OR REPLACE INTO signatures (id, key, entitlements, content)"
                           " VALUES (?1, ?2, ?3, ?4)"),
      updateSignature(writer, "UPDATE signatures SET key = ?2, entitlements = ?3 WHERE id = ?1"),
      removeSignature(writer, "DELETE FROM signatures WHERE id = ?1"),
      putUser(writer, "INSERT OR REPLACE INTO users (identifier, user) VALUES (?1, ?2)"),
      setKnowledge(writer, "UPDATE knowledge SET sequence = ?1, uuid = ?2 WHERE id = 1"),
      selectDigests(writer, "SELECT digests FROM details WHERE id = ?1"),
      reader(std::move(reading)),
      selectInfo(reader, "SELECT info FROM details WHERE id = ?1"),
      selectSignature(reader, selectSignatureSql) {
    sqlite3_wal_hook(writer.handle(), noteLogPages, &logPages);
}

int ARStore::Impl::prepared() const {
    for (const ARSqlStatement* statement :
         {&begin, &end, &rollback, &insertEntry, &insertDetail, &updateEntry, &removeEntry,
          &removeDetail, &putSignature, &updateSignature, &removeSignature, &putUser, &setKnowledge,
          &selectDigests, &selectInfo, &selectSignature}) {
        if (statement->prepared() != SQLITE_OK)
            return statement->prepared();
    }
    return SQLITE_OK;
}

int ARStore::Impl::insert(const ARNewEntry& entry) {
    const ARBundleRow& row = entry.row;
    const std::string points = AREncodePoints(row.points);
    const int code = insertEntry.run(
        row.id, number(row.kind), number(row.presence), number(row.placeholder),
        number(row.declaresTypes), ARBytesOf(row.uuid.bytes), row.path.view(),
        row.identifier.view(), row.originalIdentifier.view(), view(row.bundleIdentifier),
        view(row.bundleVersion), row.executable.view(), row.registered.secondsSinceEpoch,
        ARBytesOf(row.stamps), std::string_view(points));
    if (code != SQLITE_OK)
        return code;
    return insertDetail.run(row.id, ARBytesOf(entry.digests), std::string_view(entry.info));
}

int ARStore::Impl::update(const ARBundleRow& row) {
    return updateEntry.run(row.id, number(row.presence), number(row.placeholder),
                           ARBytesOf(row.stamps));
}

int ARStore::Impl::remove(std::int64_t id) {
    for (ARSqlStatement* statement : {&removeEntry, &removeDetail, &removeSignature}) {
        if (const int code = statement->run(id); code != SQLITE_OK)
            return code;
    }
    return SQLITE_OK;
}

int ARStore::Impl::writeSignatures(const ARStoreChanges& changes) {
    for (const auto& [id, signature] : changes.signatures) {
        const int code = putSignature.run(id, std::string_view(signature.key),
                                          std::string_view(signature.entitlements),
                                          std::string_view(signature.content));
        if (code != SQLITE_OK)
            return code;
    }
    for (const auto& [id, signature] : changes.judgedAgain) {
        const int code = updateSignature.run(id, std::string_view(signature.key),
                                             std::string_view(signature.entitlements));
        if (code != SQLITE_OK)
            return code;
    }
    return SQLITE_OK;
}

int ARStore::Impl::writeUsers(std::span<const ARPlugInUser> users) {
    for (const auto& [identifier, user] : users) {
        const int code = putUser.run(std::string_view(identifier), std::int64_t{user});
        if (code != SQLITE_OK)
            return code;
    }
    return SQLITE_OK;
}

int ARStore::Impl::setTo(const ARKnowledge& known) {
    const auto uuid = known.uuid ? std::optional(ARBytesOf(known.uuid->bytes))
                                 : std::optional<std::string_view>();
    return setKnowledge.run(static_cast<std::int64_t>(known.sequence), uuid);
}

int ARStore::Impl::write(const ARStoreChanges& changes) {
    for (const std::int64_t id : changes.removed) {
        if (const int code = remove(id); code != SQLITE_OK)
            return code;
    }
    for (const ARBundleRow& row : changes.updated) {
        if (const int code = update(row); code != SQLITE_OK)
            return code;
    }
    for (const ARNewEntry& entry : changes.added) {
        if (const int code = insert(entry); code != SQLITE_OK)
            return code;
    }
    if (const int code = writeSignatures(changes); code != SQLITE_OK)
        return code;
    if (const int code = writeUsers(changes.users); code != SQLITE_OK)
        return code;
    return setTo(changes.knowledge);
}

ARStore::ARStore(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}

ARStore::~ARStore() = default;

int ARStore::Impl::write(std::span<const ARStoreChanges> changes) {
    int code = begin.run();
    if (code != SQLITE_OK)
        return code;
    for (auto each = changes.begin(); each != changes.end() && code == SQLITE_OK; ++each)
        code = write(*each);
    if (code == SQLITE_OK)
        code = end.run();
    if (code != SQLITE_OK)
        static_cast<void>(rollback.run());
    return code;
}

std::optional<platform::Error> ARStore::commit(std::span<const ARStoreChanges> changes,
                                               ARDurability durability) {
    const bool synced = durability == ARDurability::box;
    int code = synced ? impl_->writer.execute(ARSyncedCommits) : SQLITE_OK;
    if (code == SQLITE_OK)
        code = impl_->write(changes);
    if (synced)
        static_cast<void>(impl_->writer.execute(ARUnsyncedCommits));
    impl_->shortenLog();
    return errorOf(code);
}

std::optional<platform::Error> ARStore::markComplete() {
    static const std::string sql = "PRAGMA application_id = " + std::to_string(ARCompleteMark);
    return errorOf(impl_->writer.execute(sql.c_str()));
}

std::optional<ARDigests> ARStore::digests(std::int64_t id) {
    ARSqlStatement& select = impl_->selectDigests;
    std::optional<ARDigests> found;
    select.bindAll(id);
    if (select.step() == SQLITE_ROW)
        found = digestsIn(select.bytes(0));
    select.reset();
    return found;
}

void ARStore::checkpoint() {
    impl_->mayShorten = true;
    impl_->logPages = longLog;
    impl_->shortenLog();
    sqlite3_db_release_memory(impl_->writer.handle());
}

void ARStore::Impl::shortenLog() {
    if (mayShorten && !readersHeld && logPages >= longLog)
        sqlite3_wal_checkpoint_v2(writer.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr,
                                  nullptr);
}

std::optional<std::string> ARStore::info(std::int64_t id) const {
    const std::lock_guard lock(impl_->readerLock);
    ARSqlStatement& select = impl_->selectInfo;
    std::optional<std::string> found;
    select.bindAll(id);
    if (select.step() == SQLITE_ROW)
        found = select.bytes(0);
    select.reset();
    return found;
}

std::optional<ARSignatureFacts> ARStore::signature(std::int64_t id) const {
    const std::lock_guard lock(impl_->readerLock);
    ARSqlStatement& select = impl_->selectSignature;
    std::optional<ARSignatureFacts> found;
    select.bindAll(id);
    const int code = select.step();
    const auto digests = code == SQLITE_ROW ? digestsIn(select.bytes(3)) : std::nullopt;
    if (digests) {
        found.emplace(ARSignature{std::string(select.bytes(0)), std::string(select.bytes(1)),
                                  std::string(select.bytes(2))},
                      *digests);
    }
    select.reset();
    return found;
}

// Reading anything is what begins the transaction.
void ARStore::holdReaders() {
    const std::lock_guard lock(impl_->readerLock);
    static_cast<void>(impl_->reader.execute("BEGIN; SELECT sequence FROM knowledge"));
    impl_->readersHeld = true;
}

void ARStore::releaseReaders(const std::function<void()>& show) {
    {
        const std::lock_guard lock(impl_->readerLock);
        static_cast<void>(impl_->reader.execute("COMMIT"));
        show();
    }
    impl_->readersHeld = false;
    impl_->shortenLog();
}
