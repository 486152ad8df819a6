// SPDX-License-Identifier: Apache-2.0
//
// Mapping store. State: the connections to the adapter database and to the host sync database, and
// the adapter mutex. Operations take no lock; callers serialise.
#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"

#include <fcntl.h>
#include <pthread.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"

namespace {

constexpr char kAdapterPath[] = QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor/.qor-adapter-calendar.db";
constexpr char kJournalPath[] =
    QOR_DEVICE_ROOT "/opt/usr/data/cloud-qor/.qor-adapter-calendar.db-journal";
constexpr char kHostPath[] = QOR_DEVICE_ROOT "/opt/usr/dbspace/.cloud_qor.db";
constexpr mode_t kFileMode = 0660;
constexpr int kDbOption = 0;

constexpr char kVersionTable[] = "version_table";
constexpr char kMapTable[] = "qor_event_data_table";

// clang-format off
// The schema of a fresh file, made in this order; the spacing is part of it.
constexpr const char* kSchema[] = {
    "CREATE TABLE qor_event_table( id INTEGER, version INTEGER);",
    "CREATE TABLE qor_todo_table( id INTEGER, version INTEGER);",
    "CREATE TABLE qor_event_data_table( adapter_id INTEGER PRIMARY KEY AUTOINCREMENT, calsvc_id INTEGER, calsvc_ori_id INTEGER, ori_cloud_key TEXT, exception_status INTEGER, invalid INTEGER, value TEXT, calendar_id INTEGER,exdate TEXT );",
};
// At every open, so that files made before this table existed gain it.
constexpr char kCreateVersionTable[] = "CREATE TABLE if not exists version_table( version INTEGER);";
constexpr char kCountRows[]          = "SELECT count(*) FROM %s ";
constexpr char kSeedVersion[]        = "INSERT INTO version_table(version) VALUES(0)";

constexpr char kInsertVersion[] = "INSERT INTO %s(id, version) VALUES(%d, %d)";
constexpr char kSelectVersion[] = "SELECT version FROM %s WHERE id = %d order by version desc ";
constexpr char kDeleteVersion[] = "DELETE FROM %s WHERE version <= %d";
constexpr char kSelectCalendarVersion[] = "SELECT version FROM %s ";
constexpr char kUpdateCalendarVersion[] = "UPDATE %s SET version=%d ";

constexpr char kInsertRow[] = "INSERT INTO %s (calsvc_id, calsvc_ori_id, ori_cloud_key,exception_status, invalid, value, calendar_id, exdate) VALUES(%d, %d, ?, %d, %d, ?, %d, ?)";
constexpr char kUpdateRow[] = "UPDATE %s SET calsvc_id=%d, calsvc_ori_id=%d, ori_cloud_key=?,exception_status=%d, invalid=%d, value=?, calendar_id=%d, exdate=? WHERE adapter_id=%d";
constexpr char kDeleteRows[]           = "DELETE FROM %s ";
constexpr char kDeleteRow[]            = "DELETE FROM %s WHERE adapter_id=%d";
constexpr char kDeleteExceptionRows[]  = "DELETE FROM %s WHERE calsvc_ori_id=%d";
constexpr char kSelectRow[]            = "SELECT * FROM qor_event_data_table WHERE adapter_id = %d ";
constexpr char kSelectSvcId[]          = "SELECT calsvc_id FROM qor_event_data_table WHERE adapter_id = %d ";
constexpr char kSelectIdOfEvent[]      = "SELECT adapter_id FROM qor_event_data_table WHERE calsvc_id = %d ";
constexpr char kSelectIdOfOccurrence[] = "SELECT adapter_id FROM qor_event_data_table WHERE calsvc_ori_id = %d AND exdate = '%s'";
constexpr char kSelectExceptions[]         = "SELECT * FROM qor_event_data_table WHERE calsvc_ori_id = %d ";
constexpr char kSelectExceptionsOfStatus[] = "SELECT * FROM qor_event_data_table WHERE calsvc_ori_id = %d AND exception_status = %d";
constexpr char kSelectPending[]            = "SELECT * FROM qor_event_data_table WHERE invalid = 1 ";

constexpr char kSelectCloudKey[]      = "SELECT cloud_key FROM datasync_table WHERE adapter_id = '%d' AND adapter_name='CALENDAR' ";
constexpr char kSelectIdOfCloudKey[]  = "SELECT adapter_id FROM datasync_table WHERE cloud_key = '%s' AND adapter_name='CALENDAR'";
// clang-format on

sqlite3* adapter_db = nullptr;
sqlite3* host_db = nullptr;
pthread_mutex_t adapter_mutex = PTHREAD_MUTEX_INITIALIZER;

// An SQL text; one that is longer than the buffer is cut short.
struct Sql {
    char text[2048];
};

__attribute__((format(printf, 1, 2))) Sql format_sql(const char* format, ...) {
    Sql sql;
    va_list arguments;
    va_start(arguments, format);
    // A text that is too long is cut, not refused.
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): started in the line above
    static_cast<void>(vsnprintf(sql.text, sizeof(sql.text), format, arguments));
    va_end(arguments);
    return sql;
}

// Null when SQLite refuses the text, or when the connection is closed.
Statement prepare(sqlite3* db, const char* sql) {
    sqlite3_stmt* statement = nullptr;
    if (db == nullptr || sqlite3_prepare_v2(db, sql, static_cast<int>(strlen(sql)), &statement,
                                            nullptr) != SQLITE_OK) {
        return nullptr;
    }
    return Statement(statement);
}

// A step that gave neither a row nor the end is worth a message.
bool step_failed(int rc) {
    return rc != SQLITE_ROW && rc != SQLITE_DONE;
}

// Steps a query for one integer on the adapter database. Returns SQLITE_ROW (value set), the step's
// other result, or SQLITE_DONE when the query could not be prepared, which nobody tells apart.
int select_int(const Sql& sql, int32_t* value) {
    const Statement statement = prepare(adapter_db, sql.text);
    if (!statement) {
        return SQLITE_DONE;
    }
    const int rc = sqlite3_step(statement.get());
    if (rc == SQLITE_ROW) {
        *value = sqlite3_column_int(statement.get(), 0);
    }
    return rc;
}

char* copy_column(sqlite3_stmt* statement, int column) {
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
    return text != nullptr ? strdup(text) : nullptr;
}

// The same for one text on the host sync database: an owned copy, or null.
int select_host_text(const Sql& sql, char** text) {
    const Statement statement = prepare(host_db, sql.text);
    if (!statement) {
        return SQLITE_DONE;
    }
    const int rc = sqlite3_step(statement.get());
    if (rc == SQLITE_ROW) {
        *text = copy_column(statement.get(), 0);
    }
    return rc;
}

// One result line into a row's stored fields.
void fill_row(sqlite3_stmt* statement, calendar_adapter_row* row) {
    row->adapter_id = sqlite3_column_int(statement, 0);
    row->calsvc_id = sqlite3_column_int(statement, 1);
    row->calsvc_ori_id = sqlite3_column_int(statement, 2);
    row->ori_cloud_key = copy_column(statement, 3);
    row->exception_status = sqlite3_column_int(statement, 4);
    row->invalid = sqlite3_column_int(statement, 5);
    row->value = copy_column(statement, 6);
    row->calendar_id = sqlite3_column_int(statement, 7);
    row->exdate = copy_column(statement, 8);
}

// Binds without copying: the text must live until the step. A null text is SQL NULL.
bool bind_text(sqlite3_stmt* statement, int parameter, const char* text) {
    const int length = text != nullptr ? static_cast<int>(strlen(text)) : 0;
    return sqlite3_bind_text(statement, parameter, text, length, SQLITE_STATIC) == SQLITE_OK;
}

// Runs the insert or update of a row: whether it was carried out.
bool write_row(sqlite3_stmt* statement, const calendar_adapter_row* row) {
    return bind_text(statement, 1, row->ori_cloud_key) && bind_text(statement, 2, row->value) &&
           bind_text(statement, 3, row->exdate) && sqlite3_step(statement) == SQLITE_DONE;
}

// Keeps other threads off a connection for a scope (SQLite's own mutex, which is recursive).
class ConnectionLock {
  public:
    explicit ConnectionLock(sqlite3* db) : mutex_(sqlite3_db_mutex(db)) {
        sqlite3_mutex_enter(mutex_);
    }
    ~ConnectionLock() { sqlite3_mutex_leave(mutex_); }
    ConnectionLock(const ConnectionLock&) = delete;
    ConnectionLock& operator=(const ConnectionLock&) = delete;

  private:
    sqlite3_mutex* mutex_;
};

// Gathers the rows of a query. False when a row cannot be allocated; those gathered are then lost.
bool gather_rows(sqlite3_stmt* statement, GList** rows) {
    GList* first = nullptr;
    GList* last = nullptr;
    while (sqlite3_step(statement) == SQLITE_ROW) {
        auto* row = static_cast<calendar_adapter_row*>(calloc(1, sizeof(calendar_adapter_row)));
        if (row == nullptr) {
            return false;  // Deliberate: the rows gathered so far are not released.
        }
        fill_row(statement, row);
        GList* const end = g_list_append(last, row);
        first = first != nullptr ? first : end;
        last = last != nullptr ? last->next : end;
    }
    *rows = first;  // also when a step failed: what was read is handed out
    return true;
}

// A quote would end the literal that the text stands in, so no row can be named by it.
bool fits_in_quotes(const char* text) {
    return strchr(text, '\'') == nullptr;
}

// Makes a file with the database's mode, whatever the umask. False when it cannot be opened.
bool make_file(const char* path) {
    const int fd = open(path, O_RDWR | O_CREAT, kFileMode);
    if (fd < 0) {
        return false;
    }
    static_cast<void>(fchmod(fd, kFileMode));  // not ours to change: the mode stays as it is
    close(fd);
    return true;
}

void close_db(sqlite3** db) {
    if (*db != nullptr) {
        static_cast<void>(
            db_util_close(*db));  // nothing is left to do with a connection either way
        *db = nullptr;
    }
}

}  // namespace

// ---- Connections
// -----------------------------------------------------------------------------------

int _qor_calendar_db_open(void) {
    const int probe = open(kAdapterPath, O_RDONLY);
    if (probe >= 0) {
        close(probe);
    } else {
        __qor_calendar_db_remake();
    }
    if (adapter_db == nullptr && db_util_open(kAdapterPath, &adapter_db, kDbOption) != 0) {
        adapter_db = nullptr;
        return kError;
    }
    if (host_db == nullptr && db_util_open(kHostPath, &host_db, kDbOption) != 0) {
        QOR_LOG(CRITICAL, "cloud db open failed");
        host_db = nullptr;
    }
    __qor_calendar_check_version_table();
    return 0;
}

void __qor_calendar_db_remake(void) {
    sqlite3* db = nullptr;
    const int rc = db_util_open(kAdapterPath, &db, kDbOption);
    if (rc != 0) {
        QOR_LOG(CRITICAL, "db_util_open() Failed(%d)", rc);
        return;
    }
    for (const char* statement : kSchema) {
        char* error = nullptr;
        if (sqlite3_exec(db, statement, nullptr, nullptr, &error) != SQLITE_OK) {
            QOR_LOG(CRITICAL, "remake calendar DB file is Failed : %s", error);
            sqlite3_free(error);
        }
    }
    close_db(&db);
    for (const char* path : {kAdapterPath, kJournalPath}) {
        if (!make_file(path)) {
            QOR_LOG(CRITICAL, "open Failed");
            return;
        }
    }
}

void __qor_calendar_check_version_table(void) {
    char* error = nullptr;
    if (sqlite3_exec(adapter_db, kCreateVersionTable, nullptr, nullptr, &error) != SQLITE_OK) {
        QOR_LOG(CRITICAL, "make db table is Failed : %s", error);
        sqlite3_free(error);
    }
    int32_t count = 0;
    const int rc = select_int(format_sql(kCountRows, kVersionTable), &count);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    if (rc != SQLITE_ROW || count >= 1) {
        return;
    }
    error = nullptr;
    if (sqlite3_exec(adapter_db, kSeedVersion, nullptr, nullptr, &error) != SQLITE_OK) {
        QOR_LOG(CRITICAL, "INSERT is Failed : %s", error);
        sqlite3_free(error);
    }
}

int __qor_calendar_db_check_open(void) {
    if (adapter_db != nullptr || _qor_calendar_db_open() == 0) {
        return 0;
    }
    QOR_LOG(CRITICAL, "Database is not opended");
    return kError;
}

int _qor_calendar_db_close(void) {
    close_db(&adapter_db);
    close_db(&host_db);
    return 0;
}

int _qor_calendar_db_exec(const char* sql) {
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Statement statement = prepare(adapter_db, sql);
    return statement && !step_failed(sqlite3_step(statement.get())) ? 0 : kError;
}

void _qor_calendar_lock(void) {
    const int error = pthread_mutex_lock(&adapter_mutex);
    if (error != 0) {
        QOR_LOG(CRITICAL, "mutex_lock Failed(%d)", error);
    }
}

void _qor_calendar_unlock(void) {
    const int error = pthread_mutex_unlock(&adapter_mutex);
    if (error != 0) {
        QOR_LOG(CRITICAL, "mutex_unlock Failed(%d)", error);
    }
}

// ---- Versions
// --------------------------------------------------------------------------------------

int _qor_calendar_db_insert_version(int32_t id, int32_t version, const char* table) {
    return _qor_calendar_db_exec(format_sql(kInsertVersion, table, id, version).text);
}

int _qor_calendar_db_get_version(int32_t id, int32_t* version, const char* table) {
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const int rc = select_int(format_sql(kSelectVersion, table, id), version);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return rc == SQLITE_ROW ? 0 : kError;
}

int _qor_calendar_db_delete_version(int32_t version, const char* table) {
    return _qor_calendar_db_exec(format_sql(kDeleteVersion, table, version).text);
}

int _qor_calendar_db_get_calendar_version(int32_t* version) {
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const int rc = select_int(format_sql(kSelectCalendarVersion, kVersionTable), version);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return rc == SQLITE_ROW ? 0 : kError;
}

int _qor_calendar_db_update_calendar_version(int32_t version) {
    return _qor_calendar_db_exec(format_sql(kUpdateCalendarVersion, kVersionTable, version).text);
}

// ---- Event map table
// -------------------------------------------------------------------------------

int _qor_calendar_db_insert_adapter(calendar_adapter_row* row) {
    if (row == nullptr) {
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Sql sql = format_sql(kInsertRow, kMapTable, row->calsvc_id, row->calsvc_ori_id,
                               row->exception_status, row->invalid, row->calendar_id);
    const Statement statement = prepare(adapter_db, sql.text);
    if (!statement) {
        QOR_LOG(CRITICAL, "sqlite3_prepare_v2(%s) failed(%s).", sql.text,
                sqlite3_errmsg(adapter_db));
        return kError;
    }
    {
        // The id queries store rows without the adapter mutex: the number must be this row's.
        const ConnectionLock lock(adapter_db);
        if (write_row(statement.get(), row)) {
            row->adapter_id = static_cast<int32_t>(sqlite3_last_insert_rowid(adapter_db));
            return 0;
        }
    }
    QOR_LOG(CRITICAL, "insert db fail");
    return kError;
}

// Deliberate: the adapter id argument is not used; the row names itself.
int _qor_calendar_db_update_adapter(int32_t /*adapter_id*/, const calendar_adapter_row* row) {
    if (row == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Sql sql =
        format_sql(kUpdateRow, kMapTable, row->calsvc_id, row->calsvc_ori_id, row->exception_status,
                   row->invalid, row->calendar_id, row->adapter_id);
    const Statement statement = prepare(adapter_db, sql.text);
    if (!statement) {
        return kError;
    }
    if (!write_row(statement.get(), row)) {
        QOR_LOG(CRITICAL, "insert db fail");  // Deliberate: the insert's wording.
        return kError;
    }
    return 0;
}

int _qor_calendar_db_delete_adapter(int32_t adapter_id) {
    int32_t svc_id = 0;
    static_cast<void>(
        _qor_calendar_db_get_svc_id(adapter_id, &svc_id));  // 0: nothing to cascade to
    int result = _qor_calendar_db_exec(format_sql(kDeleteRow, kMapTable, adapter_id).text);
    if (svc_id > 0) {
        result = _qor_calendar_db_exec(format_sql(kDeleteExceptionRows, kMapTable, svc_id).text);
    }
    return result;
}

int _qor_calendar_db_delete_all_adapter(void) {
    return _qor_calendar_db_exec(format_sql(kDeleteRows, kMapTable).text);
}

int _qor_calendar_db_get_adapter(int32_t adapter_id, calendar_adapter_row* row) {
    if (row == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Statement statement = prepare(adapter_db, format_sql(kSelectRow, adapter_id).text);
    if (!statement) {
        return kError;
    }
    const int rc = sqlite3_step(statement.get());
    if (rc == SQLITE_ROW) {
        fill_row(statement.get(), row);
        return 0;
    }
    if (rc != SQLITE_DONE) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return kError;
}

int _qor_calendar_db_get_svc_id(int32_t adapter_id, int32_t* svc_id) {
    if (svc_id == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const int rc = select_int(format_sql(kSelectSvcId, adapter_id), svc_id);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return rc == SQLITE_ROW ? 0 : kError;
}

// Deliberate: uses the connection as it stands, without opening it.
int32_t _qor_calendar_db_get_id_from_adapter_db(int32_t svc_id) {
    int32_t adapter_id = 0;
    const int rc = select_int(format_sql(kSelectIdOfEvent, svc_id), &adapter_id);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return rc == SQLITE_ROW ? adapter_id : kError;
}

int32_t _qor_calendar_db_get_id_with_exdate(int32_t parent_svc_id, const char* exdate) {
    if (exdate == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    int32_t adapter_id = 0;  // Deliberate: no row is 0 here, and -1 in the other lookups.
    if (!fits_in_quotes(exdate)) {
        return adapter_id;
    }
    const int rc =
        select_int(format_sql(kSelectIdOfOccurrence, parent_svc_id, exdate), &adapter_id);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(adapter_db));
    }
    return adapter_id;
}

int _qor_calendar_db_get_exdate_adapter_id_list(int32_t parent_svc_id, int32_t exception_status,
                                                GList** rows) {
    if (rows == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Sql sql = exception_status < 0
                        ? format_sql(kSelectExceptions, parent_svc_id)
                        : format_sql(kSelectExceptionsOfStatus, parent_svc_id, exception_status);
    const Statement statement = prepare(adapter_db, sql.text);
    if (!statement) {
        return kError;
    }
    if (!gather_rows(statement.get(), rows)) {
        QOR_LOG(CRITICAL, "calloc fail");
        return kError;
    }
    return 0;
}

int _qor_calendar_db_get_exception(GList** rows) {
    if (rows == nullptr) {
        QOR_LOG(CRITICAL, "fail");
        return kError;
    }
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return kError;
    }
    const Statement statement = prepare(adapter_db, kSelectPending);
    if (!statement) {
        return kError;
    }
    if (!gather_rows(statement.get(), rows)) {
        QOR_LOG(CRITICAL, "calloc fail");
        return kError;
    }
    return 0;
}

void _qor_calendar_free_adapter_row(calendar_adapter_row* row) {
    for (char** text : {&row->ori_cloud_key, &row->value, &row->exdate, &row->pending_duration}) {
        free(*text);
        *text = nullptr;
    }
    if (row->record != nullptr) {
        destroy_record(row->record);
        row->record = nullptr;
    }
}

// ---- Host sync database
// ----------------------------------------------------------------------------

char* _qor_calendar_db_get_cloud_key_from_server(int32_t adapter_id) {
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return nullptr;
    }
    char* cloud_key = nullptr;
    const int rc = select_host_text(format_sql(kSelectCloudKey, adapter_id), &cloud_key);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(host_db));
    }
    return cloud_key;
}

char* _qor_calendar_db_get_adapter_id_from_server(const char* cloud_key) {
    if (__qor_calendar_db_check_open() != 0) {
        QOR_LOG(CRITICAL, "Database is not opended");
        return nullptr;
    }
    char* adapter_id = nullptr;
    if (cloud_key == nullptr || !fits_in_quotes(cloud_key)) {
        return adapter_id;
    }
    const int rc = select_host_text(format_sql(kSelectIdOfCloudKey, cloud_key), &adapter_id);
    if (step_failed(rc)) {
        QOR_LOG(CRITICAL, "sqlite3_step() failed(%d, %s).", rc, sqlite3_errmsg(host_db));
    }
    return adapter_id;
}
