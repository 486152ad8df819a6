// SPDX-License-Identifier: Apache-2.0
//
// Account service: the accounts that are signed in, in one SQLite file of the device. State: the
// number of open connections and the file's resolved path, under one mutex. Each call opens the
// file for itself, so that every process sees every account at once. Any thread; callbacks run
// without the mutex.
#include "platform/include/account_service.h"

#include <sqlite3.h>

#include <climits>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <string>
#include <vector>

#include "platform/include/database_utility.h"

#ifndef QOR_DEVICE_ROOT
#define QOR_DEVICE_ROOT ""
#endif

struct account {
    int id;
    std::string user_name;
};

namespace {

constexpr char kFolder[] = QOR_DEVICE_ROOT "/opt/usr/dbspace";
constexpr char kFile[] = "/.account-service.db";

constexpr char kCreate[] =
    "CREATE TABLE IF NOT EXISTS accounts(id INTEGER PRIMARY KEY AUTOINCREMENT, "
    "user_name TEXT NOT NULL UNIQUE)";
constexpr char kSelectAll[] = "SELECT id, user_name FROM accounts ORDER BY id";
constexpr char kSelectByName[] = "SELECT id FROM accounts WHERE user_name = ?1";
// Ignored where another process was faster.
constexpr char kInsert[] = "INSERT OR IGNORE INTO accounts(user_name) VALUES(?1)";
constexpr char kDelete[] = "DELETE FROM accounts WHERE id = ?1";

struct Close {
    void operator()(sqlite3* db) const { static_cast<void>(db_util_close(db)); }
    void operator()(sqlite3_stmt* statement) const {
        static_cast<void>(sqlite3_finalize(statement));  // repeats the last step's error
    }
};
using Database = std::unique_ptr<sqlite3, Close>;
using Statement = std::unique_ptr<sqlite3_stmt, Close>;

std::mutex connection_mutex;
int connection_count = 0;
std::string& store_path() {  // never destroyed: calls may come while the process ends
    static auto* const path = new std::string;
    return *path;
}

int open_store(const std::string& path, Database* out_db) {
    sqlite3* db = nullptr;
    if (db_util_open(path.c_str(), &db, 0) != SQLITE_OK) {
        return ACCOUNT_ERROR_DB_FAILED;
    }
    out_db->reset(db);
    return ACCOUNT_ERROR_NONE;
}

int open_connected(Database* out_db) {
    const std::lock_guard lock(connection_mutex);
    return connection_count == 0 ? ACCOUNT_ERROR_NOT_CONNECTED : open_store(store_path(), out_db);
}

Statement prepare(const Database& db, const char* sql) {
    sqlite3_stmt* statement = nullptr;
    static_cast<void>(sqlite3_prepare_v2(db.get(), sql, -1, &statement, nullptr));  // null: failed
    return Statement(statement);
}

int read_accounts(std::vector<account>* out_accounts) {
    Database db;
    const int rc = open_connected(&db);
    if (rc != ACCOUNT_ERROR_NONE) {
        return rc;
    }
    const Statement statement = prepare(db, kSelectAll);
    if (!statement) {
        return ACCOUNT_ERROR_DB_FAILED;
    }
    int step = sqlite3_step(statement.get());
    for (; step == SQLITE_ROW; step = sqlite3_step(statement.get())) {
        const auto* name = reinterpret_cast<const char*>(sqlite3_column_text(statement.get(), 1));
        out_accounts->push_back(
            {sqlite3_column_int(statement.get(), 0), name == nullptr ? "" : name});
    }
    return step == SQLITE_DONE ? ACCOUNT_ERROR_NONE : ACCOUNT_ERROR_DB_FAILED;
}

// The id of a user name; false when there is none.
bool find_account(const Database& db, const char* user_name, int* out_account_id) {
    const Statement select = prepare(db, kSelectByName);
    if (!select || sqlite3_bind_text(select.get(), 1, user_name, -1, SQLITE_STATIC) != SQLITE_OK ||
        sqlite3_step(select.get()) != SQLITE_ROW) {
        return false;
    }
    *out_account_id = sqlite3_column_int(select.get(), 0);
    return true;
}

int insert_account(const char* user_name, int* out_account_id) {
    Database db;
    const int rc = open_connected(&db);
    if (rc != ACCOUNT_ERROR_NONE) {
        return rc;
    }
    int id = 0;
    if (!find_account(db, user_name, &id)) {
        const Statement insert = prepare(db, kInsert);
        if (!insert ||
            sqlite3_bind_text(insert.get(), 1, user_name, -1, SQLITE_STATIC) != SQLITE_OK ||
            sqlite3_step(insert.get()) != SQLITE_DONE || !find_account(db, user_name, &id)) {
            return ACCOUNT_ERROR_DB_FAILED;
        }
    }
    if (out_account_id != nullptr) {
        *out_account_id = id;
    }
    return ACCOUNT_ERROR_NONE;
}

int delete_account(int account_id) {
    Database db;
    const int rc = open_connected(&db);
    if (rc != ACCOUNT_ERROR_NONE) {
        return rc;
    }
    const Statement statement = prepare(db, kDelete);
    if (!statement || sqlite3_bind_int(statement.get(), 1, account_id) != SQLITE_OK ||
        sqlite3_step(statement.get()) != SQLITE_DONE) {
        return ACCOUNT_ERROR_DB_FAILED;
    }
    return sqlite3_changes(db.get()) == 0 ? ACCOUNT_ERROR_NO_DATA : ACCOUNT_ERROR_NONE;
}

// Resolved once, so that a later change of the current directory changes nothing. Connecting again
// goes to the device of the moment.
int connect() {
    const std::unique_ptr<char, decltype(&std::free)> folder(realpath(kFolder, nullptr),
                                                             &std::free);
    if (!folder) {
        return ACCOUNT_ERROR_DB_FAILED;
    }
    const std::string path = std::string(folder.get()) + kFile;
    Database db;
    if (open_store(path, &db) != ACCOUNT_ERROR_NONE ||
        sqlite3_exec(db.get(), kCreate, nullptr, nullptr, nullptr) != SQLITE_OK) {
        return ACCOUNT_ERROR_DB_FAILED;
    }
    const std::lock_guard lock(connection_mutex);
    store_path() = path;
    ++connection_count;
    return ACCOUNT_ERROR_NONE;
}

// Nothing is thrown across a C function.
template <typename Action>
int guarded(const Action& action) {
    try {
        return action();
    } catch (const std::bad_alloc&) {
        return ACCOUNT_ERROR_OUT_OF_MEMORY;
    }
}

}  // namespace

int account_connect(void) {
    return guarded(connect);
}

int account_disconnect(void) {
    const std::lock_guard lock(connection_mutex);
    if (connection_count == 0) {
        return ACCOUNT_ERROR_NOT_CONNECTED;
    }
    --connection_count;
    return ACCOUNT_ERROR_NONE;
}

int account_foreach_account_from_db(account_cb callback, void* user_data) {
    if (callback == nullptr) {
        return ACCOUNT_ERROR_INVALID_PARAMETER;
    }
    std::vector<account> accounts;
    const int rc = guarded([&] { return read_accounts(&accounts); });
    if (rc != ACCOUNT_ERROR_NONE) {
        return rc;
    }
    for (account& entry : accounts) {
        if (!callback(&entry, user_data)) {
            break;
        }
    }
    return ACCOUNT_ERROR_NONE;
}

int account_get_user_name(account_h account, char** out_user_name) {
    if (account == nullptr || out_user_name == nullptr) {
        return ACCOUNT_ERROR_INVALID_PARAMETER;
    }
    char* const copy = strdup(account->user_name.c_str());
    if (copy == nullptr) {
        return ACCOUNT_ERROR_OUT_OF_MEMORY;
    }
    *out_user_name = copy;
    return ACCOUNT_ERROR_NONE;
}

int account_get_account_id(account_h account, int* out_account_id) {
    if (account == nullptr || out_account_id == nullptr) {
        return ACCOUNT_ERROR_INVALID_PARAMETER;
    }
    *out_account_id = account->id;
    return ACCOUNT_ERROR_NONE;
}

int account_insert(const char* user_name, int* out_account_id) {
    if (user_name == nullptr || *user_name == '\0') {
        return ACCOUNT_ERROR_INVALID_PARAMETER;
    }
    return guarded([&] { return insert_account(user_name, out_account_id); });
}

int account_delete(int account_id) {
    return guarded([&] { return delete_account(account_id); });
}
