// SPDX-License-Identifier: Apache-2.0
#include "bench/adapter_floor.h"

#include <malloc.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "bench/document_floor.h"

namespace {

constexpr size_t kSqlSize = 2048;
constexpr guint kRetrySeconds = 60;

// clang-format off
constexpr char kInsertVersion[]   = "INSERT INTO %s(id, version) VALUES(%d, %d)";
constexpr char kSelectVersion[]   = "SELECT version FROM %s WHERE id = %d order by version desc ";
constexpr char kInsertRow[]       = "INSERT INTO %s (calsvc_id, calsvc_ori_id, ori_cloud_key,exception_status, invalid, value, calendar_id, exdate) VALUES(%d, %d, ?, %d, %d, ?, %d, ?)";
constexpr char kDeleteRow[]       = "DELETE FROM %s WHERE adapter_id=%d";
constexpr char kDeleteDerived[]   = "DELETE FROM %s WHERE calsvc_ori_id=%d";
constexpr char kSelectRow[]       = "SELECT * FROM qor_event_data_table WHERE adapter_id = %d ";
constexpr char kSelectSvcId[]     = "SELECT calsvc_id FROM qor_event_data_table WHERE adapter_id = %d ";
constexpr char kSelectIdOfEvent[] = "SELECT adapter_id FROM qor_event_data_table WHERE calsvc_id = %d ";
constexpr char kSelectDerived[]   = "SELECT * FROM qor_event_data_table WHERE calsvc_ori_id = %d ";
// clang-format on
constexpr char kVersions[] = "qor_event_table";
constexpr char kRows[] = "qor_event_data_table";

void release_memory() {
    while (sqlite3_release_memory(-1) != 0) {
    }
    malloc_trim(0);
}

Statement prepare(sqlite3* db, const char* sql) {
    sqlite3_stmt* statement = nullptr;
    sqlite3_prepare_v2(db, sql, static_cast<int>(std::strlen(sql)), &statement, nullptr);
    return Statement(statement);
}

// The first column of a statement's first row, or -1 without one.
template <typename... Values>
int run(sqlite3* db, const char* sql, Values... values) {
    char text[kSqlSize];
    std::snprintf(text, sizeof text, sql, values...);
    const Statement statement = prepare(db, text);
    return sqlite3_step(statement.get()) == SQLITE_ROW ? sqlite3_column_int(statement.get(), 0)
                                                       : -1;
}

// Fetches a row's columns, the texts copied; its event.
int read_row(sqlite3_stmt* row) {
    int event_id = 0;
    for (int column = 0; column < 9; ++column) {
        if (column == 3 || column == 6 || column == 8) {
            const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(row, column));
            const MallocText copy(text != nullptr ? strdup(text) : nullptr);
        } else if (column == 1) {
            event_id = sqlite3_column_int(row, column);
        } else {
            sqlite3_column_int(row, column);
        }
    }
    return event_id;
}

Record create_event() {
    calendar_record_h event = nullptr;
    calendar_record_create(_calendar_event._uri, &event);
    return Record(event);
}

Record fetch_event(int id) {
    calendar_record_h event = nullptr;
    calendar_db_get_record(_calendar_event._uri, id, &event);
    return Record(event);
}

char* id_text(int id) {
    char text[30] = {};
    std::snprintf(text, sizeof text, "%d", id);
    return strdup(text);
}

gboolean never(gpointer /*user_data*/) {
    return G_SOURCE_REMOVE;
}

// Walks a change list and gives the ids that visit() finds, as the host gets them.
template <typename Visit>
int collect_ids(calendar_list_h changes, Visit visit) {
    int count = 0;
    GList* first = nullptr;
    GList* last = nullptr;
    calendar_list_get_count(changes, &count);
    calendar_list_first(changes);
    for (int i = 0; i < count; ++i) {
        calendar_record_h change = nullptr;
        int numbers[4] = {};
        calendar_list_get_current_record_p(changes, &change);
        calendar_record_get_int(change, _calendar_updated_info.id, &numbers[0]);
        calendar_record_get_int(change, _calendar_updated_info.modified_status, &numbers[1]);
        calendar_record_get_int(change, _calendar_updated_info.calendar_book_id, &numbers[2]);
        calendar_record_get_int(change, _calendar_updated_info.version, &numbers[3]);
        calendar_list_next(changes);
        GList* const end = g_list_append(last, id_text(visit(numbers[0])));
        first = first != nullptr ? first : end;
        last = last != nullptr ? last->next : end;
    }
    const Owned<char*, std::free> array(
        static_cast<char**>(std::calloc(g_list_length(first), sizeof(char*))));
    char** next = array.get();
    for (const GList* entry = first; entry != nullptr; entry = entry->next) {
        *next++ = static_cast<char*>(entry->data);
    }
    g_list_free(first);
    release_memory();
    for (int i = 0; i < count; ++i) {
        std::free(array.get()[i]);
    }
    return count;
}

}  // namespace

AdapterFloor::AdapterFloor(const std::string& file) {
    sqlite3* db = nullptr;
    db_util_open(file.c_str(), &db, 0);
    db_.reset(db);
}

MallocText AdapterFloor::insert() {
    Record event = create_event();
    read_document_floor(event.get());
    calendar_record_set_int(event.get(), _calendar_event.calendar_book_id, 1);
    int event_id = 0;
    calendar_db_insert_record(event.get(), &event_id);
    record_version(event_id);
    const int item_id = insert_row(event_id);
    if (retry_timer_ != 0) {
        g_source_remove(retry_timer_);
    }
    retry_timer_ = g_timeout_add_seconds(kRetrySeconds, never, nullptr);
    MallocText id(id_text(item_id));
    event.reset();
    release_memory();
    return id;
}

GText AdapterFloor::get(int item_id) {
    char text[kSqlSize];
    std::snprintf(text, sizeof text, kSelectRow, item_id);
    Statement statement = prepare(db_.get(), text);
    sqlite3_step(statement.get());
    const int event_id = read_row(statement.get());
    statement.reset();
    Record event = fetch_event(event_id);
    GText document = write_document_floor(event.get());
    event.reset();
    release_memory();
    return document;
}

void AdapterFloor::update(int item_id) {
    Record event = create_event();
    read_document_floor(event.get());
    const int event_id = run(db_.get(), kSelectSvcId, item_id);
    calendar_db_replace_record(event.get(), event_id);
    record_version(event_id);
    event.reset();
    release_memory();
}

void AdapterFloor::remove(int item_id) {
    const int event_id = run(db_.get(), kSelectSvcId, item_id);
    calendar_db_delete_record(_calendar_event._uri, event_id);
    record_version(event_id);
    delete_row(item_id);
    release_memory();
}

int AdapterFloor::dirty_ids(calendar_list_h changes) {
    return collect_ids(changes, [this](int event_id) {
        run(db_.get(), kSelectVersion, kVersions, event_id);
        const int id = run(db_.get(), kSelectIdOfEvent, event_id);
        const Record event = fetch_event(event_id);
        int number = 0;
        char* dates = nullptr;
        calendar_record_get_int(event.get(), _calendar_event.original_event_id, &number);
        calendar_record_get_child_record_count(event.get(), _calendar_event.exception, &number);
        calendar_record_get_str_p(event.get(), _calendar_event.exdate, &dates);
        return id;
    });
}

int AdapterFloor::deleted_ids(calendar_list_h changes) {
    return collect_ids(changes, [this](int event_id) {
        run(db_.get(), kSelectVersion, kVersions, event_id);
        const int id = run(db_.get(), kSelectIdOfEvent, event_id);
        read_derived_rows(event_id);
        delete_row(id);
        return id;
    });
}

int AdapterFloor::insert_row(int event_id) {
    char text[kSqlSize];
    std::snprintf(text, sizeof text, kInsertRow, kRows, event_id, 0, 0, 0, 1);
    const Statement statement = prepare(db_.get(), text);
    for (const int parameter : {1, 2, 3}) {
        sqlite3_bind_text(statement.get(), parameter, nullptr, 0, SQLITE_STATIC);
    }
    sqlite3_step(statement.get());
    return static_cast<int>(sqlite3_last_insert_rowid(db_.get()));
}

void AdapterFloor::record_version(int event_id) {
    int version = 0;
    calendar_db_get_last_change_version(&version);
    run(db_.get(), kInsertVersion, kVersions, event_id, version);
}

void AdapterFloor::delete_row(int item_id) {
    const int event_id = run(db_.get(), kSelectSvcId, item_id);
    run(db_.get(), kDeleteRow, kRows, item_id);
    run(db_.get(), kDeleteDerived, kRows, event_id);
}

void AdapterFloor::read_derived_rows(int event_id) {
    char text[kSqlSize];
    std::snprintf(text, sizeof text, kSelectDerived, event_id);
    const Statement statement = prepare(db_.get(), text);
    while (sqlite3_step(statement.get()) == SQLITE_ROW) {
        read_row(statement.get());
    }
}
