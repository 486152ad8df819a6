// SPDX-License-Identifier: Apache-2.0
//
// Opening, schema and error codes of the store, and the mechanics of statements.
#include "platform/calendar-service/store.h"

#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <limits>
#include <new>

#include "platform/calendar-service/time_text.h"

namespace device {

namespace {

// A busy store is tried again every millisecond: longer and longer waits, which are the library's
// own way, would let a process that writes without pause keep the others out.
constexpr int kBusyWaitUs = 1000;
constexpr int kBusyTries = 5000;

// Deleted events that stay listed. The oldest are dropped when a process connects, so that the
// store of a device that never syncs does not grow for ever; a client whose version lies further
// back than that many deletions misses the dropped ones.
constexpr int kDeletedEventsKept = 100000;

constexpr int kSchemaVersion = 1;
constexpr char kGetSchemaVersion[] = "PRAGMA user_version";
constexpr char kUseLog[] = "PRAGMA journal_mode = WAL";
// One disk sync per commit, of the log.
constexpr char kSyncCommits[] = "PRAGMA synchronous = FULL";

// Property columns have the names of the properties. Times are an integer (UTC seconds) or a text
// (a local date). Ids are never used again.
constexpr char kCreateSchema[] =
    "CREATE TABLE state(version INTEGER NOT NULL);"
    "INSERT INTO state VALUES(0);"
    "CREATE TABLE books(id INTEGER PRIMARY KEY AUTOINCREMENT, name TEXT, description TEXT, "
    "account_id INTEGER, store_type INTEGER);"
    "CREATE TABLE events(id INTEGER PRIMARY KEY AUTOINCREMENT, "
    "version INTEGER NOT NULL, modified_status INTEGER NOT NULL, "
    "calendar_book_id INTEGER NOT NULL, original_event_id INTEGER NOT NULL, "
    "summary TEXT, description TEXT, location TEXT, sensitivity INTEGER, latitude REAL, "
    "longitude REAL, organizer_name TEXT, organizer_email TEXT, start_time, start_tzid TEXT, "
    "end_time, end_tzid TEXT, freq INTEGER, range_type INTEGER, until_time, count INTEGER, "
    "interval INTEGER, bysecond TEXT, byminute TEXT, byhour TEXT, byday TEXT, bymonthday TEXT, "
    "byyearday TEXT, byweekno TEXT, bymonth TEXT, bysetpos TEXT, wkst INTEGER, exdate TEXT, "
    "recurrence_id TEXT, has_alarm INTEGER);"
    "CREATE INDEX events_by_change ON events(calendar_book_id, version, modified_status);"
    "CREATE INDEX events_by_parent ON events(original_event_id);"
    "CREATE TABLE alarms(event_id INTEGER NOT NULL, position INTEGER NOT NULL, tick INTEGER, "
    "tick_unit INTEGER, PRIMARY KEY(event_id, position)) WITHOUT ROWID;"
    "CREATE TABLE deleted_events(id INTEGER PRIMARY KEY, event_id INTEGER NOT NULL, "
    "calendar_book_id INTEGER NOT NULL, version INTEGER NOT NULL);"
    "CREATE INDEX deleted_events_by_change ON deleted_events(calendar_book_id, version, event_id);"
    "CREATE INDEX deleted_events_by_event ON deleted_events(event_id);"
    "PRAGMA user_version = 1;";

constexpr char kSelectOldDeleted[] =
    "SELECT last - ?1 FROM (SELECT (SELECT max(id) FROM deleted_events) AS last, "
    "(SELECT min(id) FROM deleted_events) AS first) WHERE last - first >= ?1";
constexpr char kPruneDeleted[] = "DELETE FROM deleted_events WHERE id <= ?1";

constexpr char kBeginRead[] = "BEGIN";
constexpr char kBeginWrite[] = "BEGIN IMMEDIATE";
constexpr char kCommit[] = "COMMIT";
constexpr char kRollback[] = "ROLLBACK";

constexpr char kSelectVersion[] = "SELECT version FROM state";
constexpr char kNextVersion[] = "UPDATE state SET version = version + 1";

int wait_while_busy(void* /*unused*/, int tries) {
    static_cast<void>(usleep(kBusyWaitUs));  // waking early is no harm
    return tries < kBusyTries ? 1 : 0;
}

calendar_error_e error_of(int rc, int system_error) {
    switch (rc & 0xff) {
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
            return CALENDAR_ERROR_DB_LOCKED;
        case SQLITE_FULL:
            return CALENDAR_ERROR_FILE_NO_SPACE;
        case SQLITE_NOMEM:
            return CALENDAR_ERROR_OUT_OF_MEMORY;
        case SQLITE_TOOBIG:
            return CALENDAR_ERROR_INVALID_PARAMETER;
        case SQLITE_IOERR:  // of a full disk only in part of the cases; of a used-up quota always
            return system_error == ENOSPC || system_error == EDQUOT || system_error == EFBIG
                       ? CALENDAR_ERROR_FILE_NO_SPACE
                       : CALENDAR_ERROR_DB_FAILED;
        default:
            return CALENDAR_ERROR_DB_FAILED;
    }
}

// Reads one number from a result without parameters.
int read_number(Store& store, const char* sql) {
    const StatementOwner statement = store.prepare(sql);
    Run run(store, statement.get());
    if (!run.next()) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    return run.integer();
}

void prune_deleted_events(Store& store) {
    int last = 0;
    {
        const StatementOwner statement = store.prepare(kSelectOldDeleted);
        Run run(store, statement.get());
        last = run.bind(kDeletedEventsKept).next() ? run.integer() : 0;
    }
    if (last > 0) {
        const StatementOwner statement = store.prepare(kPruneDeleted);
        Run(store, statement.get()).bind(last).finish();
    }
}

}  // namespace

// ---- Store --------------------------------------------------------------------------------------

Store::Store(const std::string& path) {
    sqlite3* db = nullptr;
    const int rc =
        sqlite3_open_v2(path.c_str(), &db,
                        SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX, nullptr);
    db_.reset(db);
    if (rc != SQLITE_OK) {
        fail(rc);
    }
    if (sqlite3_db_readonly(db, "main") != 0) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    // Fails only without a connection.
    static_cast<void>(sqlite3_busy_handler(db, wait_while_busy, nullptr));
    use_write_ahead_log();
    execute(kSyncCommits);
    create_schema();
    prune_deleted_events(*this);
}

// Several processes may open a new store at the same moment. Switching its journal then fails at
// once in all but one of them, without asking the busy handler.
void Store::use_write_ahead_log() {
    int rc = SQLITE_BUSY;
    for (int tries = 0; rc == SQLITE_BUSY && wait_while_busy(nullptr, tries) != 0; ++tries) {
        rc = sqlite3_exec(handle(), kUseLog, nullptr, nullptr, nullptr);
    }
    if (rc != SQLITE_OK) {
        fail(rc);
    }
}

void Store::create_schema() {
    int version = read_number(*this, kGetSchemaVersion);
    if (version == 0) {
        Transaction transaction(*this, Transaction::Kind::kWrite);
        version = read_number(*this, kGetSchemaVersion);  // another process may have been faster
        if (version == 0) {
            execute(kCreateSchema);
            transaction.commit();
            return;
        }
    }
    if (version != kSchemaVersion) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
}

sqlite3_stmt* Store::prepared(const char* sql) {
    StatementOwner& statement = statements_[sql];
    if (!statement) {
        sqlite3_stmt* made = nullptr;
        const int rc =
            sqlite3_prepare_v3(handle(), sql, -1, SQLITE_PREPARE_PERSISTENT, &made, nullptr);
        if (rc != SQLITE_OK) {
            fail(rc);
        }
        statement.reset(made);
    }
    return statement.get();
}

StatementOwner Store::prepare(const std::string& sql) {
    sqlite3_stmt* made = nullptr;
    const int rc = sqlite3_prepare_v2(handle(), sql.c_str(), -1, &made, nullptr);
    if (rc != SQLITE_OK) {
        fail(rc);
    }
    return StatementOwner(made);
}

void Store::execute(const char* sql) {
    errno = 0;
    const int rc = sqlite3_exec(handle(), sql, nullptr, nullptr, nullptr);
    if (rc != SQLITE_OK) {
        fail(rc);
    }
}

void Store::fail(int rc) const {
    throw Failure{error_of(rc, errno)};
}

// ---- Run ----------------------------------------------------------------------------------------

Run::~Run() {
    static_cast<void>(sqlite3_reset(statement_));  // repeats the last step's error
    static_cast<void>(sqlite3_clear_bindings(statement_));
}

void Run::check(int rc) const {
    if (rc != SQLITE_OK) {
        store_.fail(rc);
    }
}

Run& Run::bind(int value) {
    check(sqlite3_bind_int(statement_, ++parameter_, value));
    return *this;
}

Run& Run::bind(double value) {  // a NaN is stored as NULL
    check(sqlite3_bind_double(statement_, ++parameter_, value));
    return *this;
}

Run& Run::bind(const char* text) {
    const sqlite3_uint64 length = text == nullptr ? 0 : std::strlen(text);
    check(sqlite3_bind_text64(statement_, ++parameter_, text, length, SQLITE_STATIC, SQLITE_UTF8));
    return *this;
}

Run& Run::bind(const calendar_time_s& time) {
    ++parameter_;
    if (time.type == CALENDAR_TIME_UTIME) {
        check(sqlite3_bind_int64(statement_, parameter_, time.time.utime));
    } else {
        const std::string text = date_text(time);
        check(sqlite3_bind_text(statement_, parameter_, text.data(), static_cast<int>(text.size()),
                                SQLITE_TRANSIENT));
    }
    return *this;
}

bool Run::next() {
    column_ = 0;
    errno = 0;  // SQLite keeps no system error of a failed commit
    const int rc = sqlite3_step(statement_);
    if (rc != SQLITE_ROW && rc != SQLITE_DONE) {
        store_.fail(rc);
    }
    return rc == SQLITE_ROW;
}

void Run::finish() {
    while (next()) {
    }
}

int Run::integer() {
    return sqlite3_column_int(statement_, column_++);
}

double Run::real() {
    const int column = column_++;
    return sqlite3_column_type(statement_, column) == SQLITE_NULL
               ? std::numeric_limits<double>::quiet_NaN()
               : sqlite3_column_double(statement_, column);
}

const char* Run::text() {
    const int column = column_++;
    const auto* const text = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column));
    if (text == nullptr && sqlite3_column_type(statement_, column) != SQLITE_NULL) {
        throw std::bad_alloc();
    }
    return text;
}

calendar_time_s Run::time() {
    if (sqlite3_column_type(statement_, column_) == SQLITE_TEXT) {
        return time_of_date_text(text());
    }
    calendar_time_s time{};
    time.time.utime = sqlite3_column_int64(statement_, column_++);
    return time;
}

// ---- Transaction and version --------------------------------------------------------------------

Transaction::Transaction(Store& store, Kind kind) : store_(store) {
    Run(store, kind == Kind::kRead ? kBeginRead : kBeginWrite).finish();
}

Transaction::~Transaction() {
    if (open_ && sqlite3_get_autocommit(store_.handle()) == 0) {
        // A rollback ends the transaction even where it reports an error.
        static_cast<void>(sqlite3_exec(store_.handle(), kRollback, nullptr, nullptr, nullptr));
    }
}

void Transaction::commit() {
    Run(store_, kCommit).finish();
    open_ = false;
}

int current_version(Store& store) {
    Run run(store, kSelectVersion);
    if (!run.next()) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    return run.integer();
}

int next_version(Store& store) {
    const int version = current_version(store);
    if (version == std::numeric_limits<int>::max()) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    Run(store, kNextVersion).finish();
    return version + 1;
}

}  // namespace device
