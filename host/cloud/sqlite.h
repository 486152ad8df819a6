// SPDX-License-Identifier: Apache-2.0
//
// The little of SQLite that a store needs: a connection, statements that reset themselves, a
// transaction that takes itself back, and errors told apart. One connection belongs to one thread.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "host/result.h"

namespace qor {

struct CloseDatabase {
    void operator()(sqlite3* db) const noexcept { sqlite3_close_v2(db); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

// The error that the connection's latest call ended with, told for people.
Error sqlite_error(sqlite3* db, const std::string& path, std::string_view doing);

// A prepared statement, kept for reuse. Texts are bound by reference and must outlive the step.
class Statement {
  public:
    Statement() = default;
    // SQLITE_OK, or SQLite's code.
    int prepare(sqlite3* db, const char* sql);
    // Makes it ready for another run, without bindings.
    void restart();
    void bind(int index, std::int64_t value);
    void bind(int index, std::string_view text);
    // SQLITE_ROW, SQLITE_DONE or SQLite's error code.
    int step() { return sqlite3_step(handle_.get()); }
    std::int64_t integer(int column) const;
    std::string text(int column) const;

  private:
    struct Finalize {
        void operator()(sqlite3_stmt* statement) const noexcept { sqlite3_finalize(statement); }
    };
    std::unique_ptr<sqlite3_stmt, Finalize> handle_;
};

// Restarts the statement at the end of a scope, so that it never holds a read transaction open.
class StatementRun {
  public:
    explicit StatementRun(Statement& statement) : statement_(statement) { statement_.restart(); }
    ~StatementRun() { statement_.restart(); }
    StatementRun(const StatementRun&) = delete;
    StatementRun& operator=(const StatementRun&) = delete;
    Statement* operator->() { return &statement_; }

  private:
    Statement& statement_;
};

// Begun by begin(), ended by commit(), rolled back at the end of the scope otherwise.
class Transaction {
  public:
    explicit Transaction(sqlite3* db) : db_(db) {}
    ~Transaction();
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    bool begin(bool write);
    bool commit();

  private:
    sqlite3* db_;
    bool open_ = false;
};

}  // namespace qor
