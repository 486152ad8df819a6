// SPDX-License-Identifier: Apache-2.0
//
// The little of SQLite that a store needs.
#include "host/cloud/sqlite.h"

#include <fmt/format.h>

namespace qor {

Error sqlite_error(sqlite3* db, const std::string& path, std::string_view doing) {
    const int code = db == nullptr ? SQLITE_NOMEM : sqlite3_errcode(db);
    const char* detail = db == nullptr ? "out of memory" : sqlite3_errmsg(db);
    switch (code & 0xff) {
        case SQLITE_FULL:
            return {
                ErrorKind::kFull,
                fmt::format("{}: the disk is full while {}; nothing of it was stored. Free some "
                            "space and try again",
                            path, doing)};
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
            return {ErrorKind::kLocked,
                    fmt::format("{}: locked by another program while {}; nothing of it was stored. "
                                "Try again when that program has finished",
                                path, doing)};
        case SQLITE_CORRUPT:
            return {ErrorKind::kCorrupt,
                    fmt::format("{}: the file is damaged ({}), found while {}. Put a copy back, or "
                                "save what 'sqlite3 FILE .recover' can read",
                                path, detail, doing)};
        case SQLITE_NOTADB:
            return {ErrorKind::kForeign, fmt::format("{}: not a cloud file", path)};
        case SQLITE_READONLY:
        case SQLITE_PERM:
        case SQLITE_AUTH:
            return {
                ErrorKind::kReadOnly,
                fmt::format("{}: no permission to write it, or its folder, while {}", path, doing)};
        case SQLITE_CANTOPEN:
            return {ErrorKind::kMissing, fmt::format("{}: cannot be opened ({})", path, detail)};
        default:
            return {ErrorKind::kOther, fmt::format("{}: {} while {}", path, detail, doing)};
    }
}

int Statement::prepare(sqlite3* db, const char* sql) {
    sqlite3_stmt* statement = nullptr;
    const int rc = sqlite3_prepare_v3(db, sql, -1, SQLITE_PREPARE_PERSISTENT, &statement, nullptr);
    handle_.reset(statement);
    return rc;
}

void Statement::restart() {
    sqlite3_reset(handle_.get());  // tells the latest step's error once more; that was seen already
    sqlite3_clear_bindings(handle_.get());
}

void Statement::bind(int index, std::int64_t value) {
    sqlite3_bind_int64(handle_.get(), index, value);
}

void Statement::bind(int index, std::string_view text) {
    // A view without a place is still a text, not NULL.
    const char* start = text.data() == nullptr ? "" : text.data();
    sqlite3_bind_text64(handle_.get(), index, start, text.size(), SQLITE_STATIC, SQLITE_UTF8);
}

std::int64_t Statement::integer(int column) const {
    return sqlite3_column_int64(handle_.get(), column);
}

std::string Statement::text(int column) const {
    const auto* bytes = reinterpret_cast<const char*>(sqlite3_column_text(handle_.get(), column));
    const auto size = static_cast<std::size_t>(sqlite3_column_bytes(handle_.get(), column));
    return bytes == nullptr ? std::string() : std::string(bytes, size);
}

Transaction::~Transaction() {
    if (open_ && sqlite3_get_autocommit(db_) == 0) {
        static_cast<void>(sqlite3_exec(db_, "ROLLBACK", nullptr, nullptr, nullptr));
    }
}

bool Transaction::begin(bool write) {
    const char* sql = write ? "BEGIN IMMEDIATE" : "BEGIN";
    open_ = sqlite3_exec(db_, sql, nullptr, nullptr, nullptr) == SQLITE_OK;
    return open_;
}

bool Transaction::commit() {
    if (sqlite3_exec(db_, "COMMIT", nullptr, nullptr, nullptr) != SQLITE_OK) {
        return false;
    }
    open_ = false;
    return true;
}

}  // namespace qor
