#pragma once

#include <cstdint>
#include <expected>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include <sqlite3.h>

// Thin owners of SQLite's objects, for the sources of the store alone. Result codes are SQLite's.

// One open database. Owned by the store; one thread at a time.
class ARSqlConnection {
public:
    [[nodiscard]] static std::expected<ARSqlConnection, int> open(const std::string& path,
                                                                  int flags);

    [[nodiscard]] int execute(const char* sql);

    [[nodiscard]] sqlite3* handle() const { return database_.get(); }

private:
    struct Close {
        void operator()(sqlite3* database) const { sqlite3_close_v2(database); }
    };

    explicit ARSqlConnection(sqlite3* database) : database_(database) {}

    std::unique_ptr<sqlite3, Close> database_;
};

// One prepared statement. Its connection must outlive it. Bound texts and blobs are not copied:
// they must live until the statement is reset.
class ARSqlStatement {
public:
    ARSqlStatement(ARSqlConnection& connection, const char* sql);

    // SQLITE_OK when the statement could be prepared.
    [[nodiscard]] int prepared() const { return prepared_; }

    // Binds all parameters, runs to the end and resets.
    template <class... Parameters>
    [[nodiscard]] int run(const Parameters&... parameters) {
        bindAll(parameters...);
        int code = step();
        while (code == SQLITE_ROW)
            code = step();
        reset();
        return code == SQLITE_DONE ? SQLITE_OK : code;
    }

    template <class... Parameters>
    void bindAll(const Parameters&... parameters) {
        int index = 0;
        (bind(++index, parameters), ...);
    }

    // SQLITE_ROW, SQLITE_DONE or an error.
    [[nodiscard]] int step();
    void reset();

    [[nodiscard]] bool isNull(int column) const;
    [[nodiscard]] std::int64_t integer(int column) const;
    [[nodiscard]] double real(int column) const;
    // Valid until the next step or reset.
    [[nodiscard]] std::string_view bytes(int column) const;

private:
    struct Finalize {
        void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
    };

    void bind(int index, std::int64_t number);
    void bind(int index, double number);
    void bind(int index, std::string_view blob);
    void bind(int index, const std::optional<std::string_view>& blob); // nothing is NULL

    std::unique_ptr<sqlite3_stmt, Finalize> statement_;
    int prepared_;
};
