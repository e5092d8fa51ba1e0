#include "bench/BareProgram.h"

#include <cstdint>
#include <fcntl.h>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include <expat.h>
#include <openssl/sha.h>
#include <sqlite3.h>

namespace bench {

namespace {

struct Closer {
    void operator()(sqlite3* database) const { sqlite3_close(database); }

    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};

using Database = std::unique_ptr<sqlite3, Closer>;
using Statement = std::unique_ptr<sqlite3_stmt, Closer>;

Database openDatabase(const std::string& path, int flags) {
    sqlite3* opened = nullptr;
    const int status = sqlite3_open_v2(path.c_str(), &opened, flags, nullptr);
    Database database(opened);
    if (status != SQLITE_OK)
        throw std::runtime_error("cannot open " + path);
    return database;
}

Statement prepare(const Database& database, const std::string& text) {
    sqlite3_stmt* made = nullptr;
    if (sqlite3_prepare_v2(database.get(), text.c_str(), -1, &made, nullptr) != SQLITE_OK)
        throw std::runtime_error(sqlite3_errmsg(database.get()));
    return Statement(made);
}

void execute(const Database& database, const char* text) {
    if (sqlite3_exec(database.get(), text, nullptr, nullptr, nullptr) != SQLITE_OK)
        throw std::runtime_error(sqlite3_errmsg(database.get()));
}

std::vector<std::string> linesOf(const std::string& path) {
    std::ifstream file(path);
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);)
        lines.push_back(line);
    return lines;
}

// Touches every column of every row of a table; answers how many bytes that were.
std::uint64_t loadTable(const Database& database, const std::string& table) {
    const Statement rows = prepare(database, "SELECT * FROM \"" + table + "\"");
    std::uint64_t bytes = 0;
    while (sqlite3_step(rows.get()) == SQLITE_ROW) {
        for (int column = 0; column < sqlite3_column_count(rows.get()); ++column) {
            sqlite3_column_blob(rows.get(), column);
            bytes += static_cast<std::uint64_t>(sqlite3_column_bytes(rows.get(), column));
        }
    }
    return bytes;
}

std::string contentOf(const std::string& path, struct stat& status) {
    std::string content;
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0 || fstat(fd, &status) != 0)
        throw std::runtime_error("cannot read " + path);
    content.resize(static_cast<std::size_t>(status.st_size));
    const ssize_t got = read(fd, content.data(), content.size());
    close(fd);
    content.resize(got > 0 ? static_cast<std::size_t>(got) : 0);
    return content;
}

std::uint64_t elementsOf(const std::string& xml) {
    std::uint64_t count = 0;
    XML_Parser parser = XML_ParserCreate(nullptr);
    XML_SetUserData(parser, &count);
    XML_SetElementHandler(
        parser,
        [](void* counter, const XML_Char*, const XML_Char**) {
            ++*static_cast<std::uint64_t*>(counter);
        },
        [](void*, const XML_Char*) {});
    XML_SetCharacterDataHandler(parser, [](void* counter, const XML_Char*, int) {
        ++*static_cast<std::uint64_t*>(counter);
    });
    XML_Parse(parser, xml.data(), static_cast<int>(xml.size()), 1);
    XML_ParserFree(parser);
    return count;
}

void insert(const Statement& row, const std::string& path, const struct stat& status,
            const std::string& content, std::uint64_t elements) {
    unsigned char hash[SHA256_DIGEST_LENGTH];
    SHA256(reinterpret_cast<const unsigned char*>(content.data()), content.size(), hash);
    const bool kept = elements > 0; // an executable's bytes are only hashed
    sqlite3_reset(row.get());
    sqlite3_bind_text(row.get(), 1, path.data(), static_cast<int>(path.size()), SQLITE_STATIC);
    sqlite3_bind_int64(row.get(), 2, static_cast<sqlite3_int64>(status.st_ino));
    sqlite3_bind_int64(row.get(), 3, status.st_size);
    sqlite3_bind_int64(row.get(), 4, status.st_ctim.tv_sec);
    sqlite3_bind_blob(row.get(), 5, hash, sizeof hash, SQLITE_STATIC);
    sqlite3_bind_blob(row.get(), 6, content.data(), kept ? static_cast<int>(content.size()) : 0,
                      SQLITE_STATIC);
    if (sqlite3_step(row.get()) != SQLITE_DONE)
        throw std::runtime_error("cannot insert");
}

} // namespace

int bareWarmStart(const std::string& list, const std::string& database) {
    struct stat status{};
    for (const std::string& path : linesOf(list)) {
        if (stat(path.c_str(), &status) != 0)
            return 1;
    }
    const Database rows = openDatabase(database, SQLITE_OPEN_READWRITE);
    const Statement tables = prepare(rows, "SELECT name FROM sqlite_master WHERE type = 'table'");
    std::uint64_t bytes = 0;
    while (sqlite3_step(tables.get()) == SQLITE_ROW) {
        const auto* name = reinterpret_cast<const char*>(sqlite3_column_text(tables.get(), 0));
        bytes += loadTable(rows, name);
    }
    return bytes > 0 ? 0 : 1;
}

int bareFirstStart(const std::string& list, const std::string& database) {
    const Database rows = openDatabase(database, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
    execute(rows, "PRAGMA journal_mode = WAL; PRAGMA synchronous = NORMAL;"
                  "CREATE TABLE files (path TEXT PRIMARY KEY, inode INTEGER, size INTEGER,"
                  " changed INTEGER, hash BLOB, content BLOB); BEGIN");
    const Statement row = prepare(rows, "INSERT INTO files VALUES (?, ?, ?, ?, ?, ?)");
    for (const std::string& path : linesOf(list)) {
        struct stat status{};
        if (stat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode))
            continue;
        const std::string content = contentOf(path, status);
        const bool info = path.ends_with("/Info.plist");
        insert(row, path, status, content, info ? elementsOf(content) : 0);
    }
    execute(rows, "COMMIT");
    return 0;
}

} // namespace bench
