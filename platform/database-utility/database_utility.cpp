// SPDX-License-Identifier: Apache-2.0
//
// Database utility: SQLite connections with the device's busy timeout. No state, any thread.
#include "platform/include/database_utility.h"

#include <sqlite3.h>

namespace {

constexpr int kBusyTimeoutMs = 5000;

}  // namespace

int db_util_open(const char* path, sqlite3** out_db, int option) {
    if (out_db == nullptr) {
        return SQLITE_MISUSE;
    }
    *out_db = nullptr;
    if (path == nullptr || *path == '\0' || option != 0) {
        return SQLITE_MISUSE;
    }
    sqlite3* db = nullptr;
    int rc = sqlite3_open_v2(
        path, &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_FULLMUTEX, nullptr);
    if (rc == SQLITE_OK) {
        rc = sqlite3_busy_timeout(db, kBusyTimeoutMs);
    }
    if (rc != SQLITE_OK) {
        static_cast<void>(sqlite3_close(db));  // nothing was prepared, so it cannot fail
        return rc;
    }
    *out_db = db;
    return SQLITE_OK;
}

int db_util_close(sqlite3* db) {
    return sqlite3_close(db);
}
