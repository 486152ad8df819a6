// SPDX-License-Identifier: Apache-2.0
//
// A connection to an SQLite file for the host's own tables: statements kept for reuse, values bound
// and read by type, errors thrown as Failure. One connection belongs to one thread.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>

namespace qor {

class Connection;

// One run of a statement; the statement is reset at the end of the scope.
class Rows {
  public:
    Rows(const Connection& connection, sqlite3_stmt* statement)
        : connection_(connection), statement_(statement) {}
    Rows(Rows&& other) noexcept
        : connection_(other.connection_), statement_(std::exchange(other.statement_, nullptr)) {}
    Rows& operator=(Rows&&) = delete;
    ~Rows();

    bool next();  // false past the last line
    std::int64_t integer(int column) const { return sqlite3_column_int64(statement_, column); }
    bool null(int column) const { return sqlite3_column_type(statement_, column) == SQLITE_NULL; }
    std::string text(int column) const;  // empty for NULL

  private:
    const Connection& connection_;
    sqlite3_stmt* statement_;
};

class Connection {
  public:
    enum class Mode { kReadOnly, kReadWrite, kCreate };
    Connection(std::string path, Mode mode);

    // Runs statements without values.
    void script(const char* sql);

    // Runs one statement; each distinct literal is prepared once. Texts must outlive the Rows.
    template <typename... Values>
    Rows query(const char* sql, const Values&... values) {
        sqlite3_stmt* statement = prepare(sql);
        int index = 0;
        (bind(statement, ++index, values), ...);
        return Rows(*this, statement);
    }
    template <typename... Values>
    void run(const char* sql, const Values&... values) {
        Rows rows = query(sql, values...);
        while (rows.next()) {
        }
    }
    // The first column of the first line.
    template <typename... Values>
    std::int64_t number(const char* sql, const Values&... values) {
        Rows rows = query(sql, values...);
        return rows.next() ? rows.integer(0) : 0;
    }

    std::int64_t last_id() const { return sqlite3_last_insert_rowid(db_.get()); }
    [[noreturn]] void fail(std::string_view doing) const;

  private:
    sqlite3_stmt* prepare(const char* sql);
    static void bind(sqlite3_stmt* statement, int index, std::int64_t value);
    static void bind(sqlite3_stmt* statement, int index, std::string_view text);
    static void bind(sqlite3_stmt* statement, int index, const std::optional<std::int64_t>& value);

    struct Close {
        void operator()(sqlite3* db) const noexcept { sqlite3_close_v2(db); }
    };
    struct Finalize {
        void operator()(sqlite3_stmt* statement) const noexcept { sqlite3_finalize(statement); }
    };
    std::string path_;
    std::unique_ptr<sqlite3, Close> db_;
    std::unordered_map<const char*, std::unique_ptr<sqlite3_stmt, Finalize>> statements_;
};

// A write transaction: everything until commit() happens together, or not at all.
class WriteBatch {
  public:
    explicit WriteBatch(Connection& connection);
    WriteBatch(const WriteBatch&) = delete;
    WriteBatch& operator=(const WriteBatch&) = delete;
    ~WriteBatch();
    void commit();

  private:
    Connection& connection_;
    bool open_ = true;
};

}  // namespace qor
