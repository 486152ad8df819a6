// SPDX-License-Identifier: Apache-2.0
//
// The store: one SQLite connection with its prepared statements, and the transactions on it. Used
// under the service's mutex. Everything here throws Failure when SQLite fails.
#pragma once

#include <sqlite3.h>

#include <memory>
#include <string>
#include <unordered_map>

#include "platform/calendar-service/guard.h"
#include "platform/include/calendar_service.h"

namespace device {

struct CloseDatabase {
    void operator()(sqlite3* db) const { static_cast<void>(sqlite3_close(db)); }
};
struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const {
        static_cast<void>(sqlite3_finalize(statement));  // repeats the last step's error
    }
};
using StatementOwner = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

class Store {
  public:
    // Opens the file, creating it when absent, and brings it to the current schema.
    explicit Store(const std::string& path);

    // The statement of a text, prepared at its first use. The text must be a constant: it is told
    // from others by its address.
    sqlite3_stmt* prepared(const char* sql);
    StatementOwner prepare(const std::string& sql);  // for a text made for one use
    void execute(const char* sql);

    // Throws the Failure that SQLite's last error stands for.
    [[noreturn]] void fail(int rc) const;
    sqlite3* handle() const { return db_.get(); }

  private:
    void use_write_ahead_log();
    void create_schema();

    std::unique_ptr<sqlite3, CloseDatabase> db_;
    std::unordered_map<const char*, StatementOwner> statements_;  // finalized before the close
};

// One run of a statement. Parameters are bound and columns read in their order.
class Run {
  public:
    Run(Store& store, const char* sql) : Run(store, store.prepared(sql)) {}
    Run(Store& store, sqlite3_stmt* statement) : store_(store), statement_(statement) {}
    ~Run();
    Run(const Run&) = delete;
    Run& operator=(const Run&) = delete;

    Run& bind(int value);
    Run& bind(double value);
    Run& bind(const char* text);  // borrowed until the run ends; null is NULL
    Run& bind(const calendar_time_s& time);

    bool next();    // whether there is a row
    void finish();  // runs a statement that has no rows

    // Columns of the row, from the first on.
    int integer();
    double real();
    const char* text();  // borrowed until next(); null for NULL
    calendar_time_s time();

  private:
    void check(int rc) const;

    Store& store_;
    sqlite3_stmt* statement_;
    int parameter_ = 0;
    int column_ = 0;
};

// Rolled back unless committed.
class Transaction {
  public:
    enum class Kind { kRead, kWrite };
    Transaction(Store& store, Kind kind);
    ~Transaction();
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;

    void commit();  // a write is on the disk when it returns

  private:
    Store& store_;
    bool open_ = true;
};

// The store's change version, and one more of it within a write.
int current_version(Store& store);
int next_version(Store& store);

}  // namespace device
