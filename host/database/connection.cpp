// SPDX-License-Identifier: Apache-2.0
//
// A connection to an SQLite file.
#include "host/database/connection.h"

#include <fmt/format.h>

#include <utility>

#include "host/failure.h"

namespace qor {

namespace {

constexpr int kBusyTimeoutMs = 10000;

int open_flags(Connection::Mode mode) {
    switch (mode) {
        case Connection::Mode::kReadOnly:
            return SQLITE_OPEN_READONLY;
        case Connection::Mode::kReadWrite:
            return SQLITE_OPEN_READWRITE;
        case Connection::Mode::kCreate:
            break;
    }
    return SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
}

}  // namespace

Rows::~Rows() {
    if (statement_ != nullptr) {
        sqlite3_reset(statement_);  // tells the latest step's error once more; that was thrown
        sqlite3_clear_bindings(statement_);
    }
}

bool Rows::next() {
    const int rc = sqlite3_step(statement_);
    if (rc != SQLITE_ROW && rc != SQLITE_DONE) {
        connection_.fail(sqlite3_sql(statement_));
    }
    return rc == SQLITE_ROW;
}

std::string Rows::text(int column) const {
    const unsigned char* text = sqlite3_column_text(statement_, column);
    if (text == nullptr) {
        return {};
    }
    return {reinterpret_cast<const char*>(text),
            static_cast<std::size_t>(sqlite3_column_bytes(statement_, column))};
}

Connection::Connection(std::string path, Mode mode) : path_(std::move(path)) {
    sqlite3* db = nullptr;
    const int rc = sqlite3_open_v2(path_.c_str(), &db, open_flags(mode), nullptr);
    db_.reset(db);
    if (rc != SQLITE_OK) {
        fail("opening it");
    }
    sqlite3_busy_timeout(db, kBusyTimeoutMs);
}

void Connection::script(const char* sql) {
    if (sqlite3_exec(db_.get(), sql, nullptr, nullptr, nullptr) != SQLITE_OK) {
        fail(sql);
    }
}

void Connection::fail(std::string_view doing) const {
    throw Failure(fmt::format("{}: {} ({})", path_,
                              db_ ? sqlite3_errmsg(db_.get()) : "out of memory",
                              doing.substr(0, doing.find('\n'))));
}

sqlite3_stmt* Connection::prepare(const char* sql) {
    auto& statement = statements_[sql];
    if (!statement) {
        sqlite3_stmt* made = nullptr;
        if (sqlite3_prepare_v3(db_.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &made, nullptr) !=
            SQLITE_OK) {
            fail(sql);
        }
        statement.reset(made);
    }
    return statement.get();
}

void Connection::bind(sqlite3_stmt* statement, int index, std::int64_t value) {
    sqlite3_bind_int64(statement, index, value);
}

void Connection::bind(sqlite3_stmt* statement, int index, std::string_view text) {
    sqlite3_bind_text64(statement, index, text.data() == nullptr ? "" : text.data(), text.size(),
                        SQLITE_STATIC, SQLITE_UTF8);
}

void Connection::bind(sqlite3_stmt* statement, int index,
                      const std::optional<std::int64_t>& value) {
    if (value) {
        bind(statement, index, *value);
    } else {
        sqlite3_bind_null(statement, index);
    }
}

WriteBatch::WriteBatch(Connection& connection) : connection_(connection) {
    connection_.script("BEGIN IMMEDIATE");
}

WriteBatch::~WriteBatch() {
    if (!open_) {
        return;
    }
    try {
        connection_.script("ROLLBACK");
    } catch (const Failure&) {
        open_ = false;  // SQLite took the transaction back itself when its statement failed
    }
}

void WriteBatch::commit() {
    connection_.script("COMMIT");
    open_ = false;
}

}  // namespace qor
