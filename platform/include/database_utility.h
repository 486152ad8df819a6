// SPDX-License-Identifier: Apache-2.0
//
// The device's database utility: opens SQLite files the way the device wants them opened.
#ifndef QOR_PLATFORM_DATABASE_UTILITY_H
#define QOR_PLATFORM_DATABASE_UTILITY_H

struct sqlite3;

#ifdef __cplusplus
extern "C" {
#endif

// Opens a database file, creating it when absent, with a busy timeout of five seconds. The option
// is reserved and must be 0. Returns 0 and the connection (closed with db_util_close()), or an
// SQLite result code (https://www.sqlite.org/rescode.html); the connection is then null. Any
// thread.
int db_util_open(const char *path, struct sqlite3 **out_db, int option);

// Closes a connection. Returns 0 or an SQLite result code.
int db_util_close(struct sqlite3 *db);

#ifdef __cplusplus
}
#endif

#endif  // QOR_PLATFORM_DATABASE_UTILITY_H
