#include "AppRegistry/ARSql.h"

std::expected<ARSqlConnection, int> ARSqlConnection::open(const std::string& path, int flags) {
    sqlite3* database = nullptr;
    const int code = sqlite3_open_v2(path.c_str(), &database, flags, nullptr);
    ARSqlConnection connection(database); // also a failed open leaves something to close
    if (code != SQLITE_OK)
        return std::unexpected(code);
    return connection;
}

int ARSqlConnection::execute(const char* sql) {
    return sqlite3_exec(handle(), sql, nullptr, nullptr, nullptr);
}

ARSqlStatement::ARSqlStatement(ARSqlConnection& connection, const char* sql) {
    sqlite3_stmt* statement = nullptr;
    prepared_ = sqlite3_prepare_v3(connection.handle(), sql, -1, SQLITE_PREPARE_PERSISTENT,
                                   &statement, nullptr);
    statement_.reset(statement);
}

int ARSqlStatement::step() {
    return statement_ ? sqlite3_step(statement_.get()) : SQLITE_MISUSE;
}

void ARSqlStatement::reset() {
    sqlite3_reset(statement_.get());
}

bool ARSqlStatement::isNull(int column) const {
    return sqlite3_column_type(statement_.get(), column) == SQLITE_NULL;
}

std::int64_t ARSqlStatement::integer(int column) const {
    return sqlite3_column_int64(statement_.get(), column);
}

double ARSqlStatement::real(int column) const {
    return sqlite3_column_double(statement_.get(), column);
}

std::string_view ARSqlStatement::bytes(int column) const {
    const void* content = sqlite3_column_blob(statement_.get(), column);
    const int size = sqlite3_column_bytes(statement_.get(), column);
    return {static_cast<const char*>(content), static_cast<std::size_t>(size)};
}

void ARSqlStatement::bind(int index, std::int64_t number) {
    sqlite3_bind_int64(statement_.get(), index, number);
}

void ARSqlStatement::bind(int index, double number) {
    sqlite3_bind_double(statement_.get(), index, number);
}

void ARSqlStatement::bind(int index, std::string_view blob) {
    // A view of nothing would bind NULL.
    const char* content = blob.data() ? blob.data() : "";
    sqlite3_bind_blob64(statement_.get(), index, content, blob.size(), SQLITE_STATIC);
}

void ARSqlStatement::bind(int index, const std::optional<std::string_view>& blob) {
    if (blob) {
        bind(index, *blob);
    } else {
        sqlite3_bind_null(statement_.get(), index);
    }
}
