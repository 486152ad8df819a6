// SPDX-License-Identifier: Apache-2.0
//
// Mapping store: the adapter database (event map table, version tables), the lookups in the host
// sync database, and the adapter mutex. Both connections and the mutex are process-wide. No
// operation takes the mutex itself; callers serialise.
#pragma once

#include <glib.h>

#include <cstdint>

#include "common/device.h"

// The table that records the versions of the adapter's own writes.
#define QOR_EVENT_TABLE "qor_event_table"

// One row of the event map table, and the working fields of the event document parse.
struct calendar_adapter_row {
    int32_t adapter_id;     // the item number that the host knows; given by the insert
    int32_t calsvc_id;      // the item's own event; 0 for a cancelled instance or an unapplied row
    int32_t calsvc_ori_id;  // the parent event of an exception; 0 otherwise
    char* ori_cloud_key;  // owned: the parent's cloud key while the parent is unknown on the device
    int32_t exception_status;  // 0 ordinary event, 1 changed instance, 2 cancelled instance
    int32_t invalid;           // 1 pending (not applied to the calendar service), 0 applied
    char* value;               // owned: the document text of a pending row
    int32_t calendar_id;       // the adapter's calendar book
    char* exdate;              // owned: recurrence-id text of an exception's occurrence
    // Not stored: used while an event document is read.
    calendar_record_h record;      // owned: the event record that the parse fills
    uint8_t is_allday;             // "allDay" "1" has been read
    uint8_t has_start;             // "dtstart" has been stored
    uint8_t has_pending_duration;  // a "duration" waits for "dtstart"
    char* pending_duration;        // owned: the waiting duration text
};

extern "C" {

// ---- Connections
// -----------------------------------------------------------------------------------

// Opens both databases, making the adapter database when its file is missing. 0 when the adapter
// database is open (whatever happened to the host's), -1 otherwise.
int _qor_calendar_db_open(void);
void __qor_calendar_db_remake(void);
void __qor_calendar_check_version_table(void);

// 0 when the adapter database is, or now becomes, open; -1 otherwise.
int __qor_calendar_db_check_open(void);

// Closes both databases. Always 0.
int _qor_calendar_db_close(void);

// Runs the first statement of an SQL text on the adapter database and drops any result row. 0 or
// -1.
int _qor_calendar_db_exec(const char* sql);

// The adapter mutex. Not recursive.
void _qor_calendar_lock(void);
void _qor_calendar_unlock(void);

// ---- Versions
// --------------------------------------------------------------------------------------

// Records that the adapter's own write of an event made a version. 0 or -1.
int _qor_calendar_db_insert_version(int32_t id, int32_t version, const char* table);

// 0 and the highest version recorded for an event; -1 otherwise, the output untouched.
int _qor_calendar_db_get_version(int32_t id, int32_t* version, const char* table);

// Forgets the versions up to and including one. 0 or -1.
int _qor_calendar_db_delete_version(int32_t version, const char* table);

// The version up to which the host has taken the changes. 0 or -1 (the output then untouched).
int _qor_calendar_db_get_calendar_version(int32_t* version);
int _qor_calendar_db_update_calendar_version(int32_t version);

// ---- Event map table
// -------------------------------------------------------------------------------

// Stores a row and gives it its adapter_id. 0 or -1.
int _qor_calendar_db_insert_adapter(calendar_adapter_row* row);

// Rewrites the row of row->adapter_id; the first argument is not used. 0 (also when there is no
// such row) or -1.
int _qor_calendar_db_update_adapter(int32_t adapter_id, const calendar_adapter_row* row);

// Deletes a row and, when it has a calendar-service id, the rows of that event's exceptions. Result
// of the last delete.
int _qor_calendar_db_delete_adapter(int32_t adapter_id);
int _qor_calendar_db_delete_all_adapter(void);

// 0 and the stored fields (texts are owned copies); -1 when there is no row or on failure.
int _qor_calendar_db_get_adapter(int32_t adapter_id, calendar_adapter_row* row);

// 0 and the row's calendar-service id (0 for a row without one); -1 otherwise, the output
// untouched.
int _qor_calendar_db_get_svc_id(int32_t adapter_id, int32_t* svc_id);

// The adapter id of a calendar-service id; -1 when there is none.
int32_t _qor_calendar_db_get_id_from_adapter_db(int32_t svc_id);

// The adapter id of an occurrence of a parent; 0 when there is none, -1 for a null text or a closed
// database.
int32_t _qor_calendar_db_get_id_with_exdate(int32_t parent_svc_id, const char* exdate);

// 0 and the rows of a parent's exceptions (of one status, or of any for a negative one): newly
// allocated rows, each released with _qor_calendar_free_adapter_row() and free(). -1 on failure.
int _qor_calendar_db_get_exdate_adapter_id_list(int32_t parent_svc_id, int32_t exception_status,
                                                GList** rows);

// The same for every pending row.
int _qor_calendar_db_get_exception(GList** rows);

// Releases what a row owns, not the row; integers and flags stay.
void _qor_calendar_free_adapter_row(calendar_adapter_row* row);

// ---- Host sync database
// ----------------------------------------------------------------------------

// Owned copies (free()), or null when the host does not know the item or its database is not there.
char* _qor_calendar_db_get_cloud_key_from_server(int32_t adapter_id);
char* _qor_calendar_db_get_adapter_id_from_server(const char* cloud_key);
}

// A zero-filled row on the stack that releases what it owns.
struct OwnedRow : calendar_adapter_row {
    OwnedRow() noexcept : calendar_adapter_row() {}
    ~OwnedRow() { release(); }
    OwnedRow(const OwnedRow&) = delete;
    OwnedRow& operator=(const OwnedRow&) = delete;
    void release() noexcept { _qor_calendar_free_adapter_row(this); }
};
