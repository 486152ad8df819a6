// SPDX-License-Identifier: Apache-2.0
//
// The device's calendar service: typed records in books, children, change versions, notification.
//
// Every function returns CALENDAR_ERROR_NONE (0) or a negative calendar_error_e; outputs are
// written on success only. Every function may be called from any thread; one record, list, query
// or filter handle must not be used by two threads at once. A misuse (a null handle, an unknown
// property, a setter or getter of another type, an id that does not exist) is an error code.
#ifndef QOR_PLATFORM_CALENDAR_SERVICE_H
#define QOR_PLATFORM_CALENDAR_SERVICE_H

// NOLINTBEGIN(modernize-use-using, modernize-deprecated-headers): C reads this header too.

#include <stdbool.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
    CALENDAR_ERROR_NONE = 0,
    CALENDAR_ERROR_OUT_OF_MEMORY = -12,
    CALENDAR_ERROR_INVALID_PARAMETER = -22,
    CALENDAR_ERROR_NO_DATA = -61,         // the id, child or list position does not exist
    CALENDAR_ERROR_NOT_SUPPORTED = -95,   // the view or filter does not offer this
    CALENDAR_ERROR_NOT_CONNECTED = -107,  // calendar_connect() has not succeeded
    CALENDAR_ERROR_FILE_NO_SPACE = -28,   // the store's disk is full
    CALENDAR_ERROR_DB_LOCKED = -16,       // another process kept the store locked too long
    CALENDAR_ERROR_DB_FAILED = -5,        // any other failure of the store
} calendar_error_e;

// ---- Times ------------------------------------------------------------------------------------

typedef enum {
    CALENDAR_TIME_UTIME = 0,      // a UTC instant: time.utime
    CALENDAR_TIME_LOCALTIME = 1,  // a local date, for all-day events: time.date
} calendar_time_type_e;

typedef struct {
    calendar_time_type_e type;
    union {
        int64_t utime;  // seconds since 1970-01-01 00:00:00 UTC
        struct {
            int year;
            int month;  // 1 to 12
            int mday;   // 1 to 31
            int hour;
            int minute;
            int second;
            bool is_leap_month;
        } date;
    } time;
} calendar_time_s;

// ---- Values of integer properties ---------------------------------------------------------------

typedef enum {
    CALENDAR_BOOK_TYPE_NONE = 0,
    CALENDAR_BOOK_TYPE_EVENT = 1,
    CALENDAR_BOOK_TYPE_TODO = 2
} calendar_book_type_e;

typedef enum {
    CALENDAR_RECURRENCE_NONE = 0,
    CALENDAR_RECURRENCE_DAILY = 1,
    CALENDAR_RECURRENCE_WEEKLY = 2,
    CALENDAR_RECURRENCE_MONTHLY = 3,
    CALENDAR_RECURRENCE_YEARLY = 4,
} calendar_recurrence_frequency_e;

typedef enum {
    CALENDAR_RANGE_UNTIL = 0,
    CALENDAR_RANGE_COUNT = 1,
    CALENDAR_RANGE_NONE = 2
} calendar_range_type_e;

typedef enum {
    CALENDAR_SUNDAY = 1,
    CALENDAR_MONDAY = 2,
    CALENDAR_TUESDAY = 3,
    CALENDAR_WEDNESDAY = 4,
    CALENDAR_THURSDAY = 5,
    CALENDAR_FRIDAY = 6,
    CALENDAR_SATURDAY = 7,
} calendar_days_of_week_e;

typedef enum {  // _calendar_alarm.tick_unit: the length of one tick in seconds
    CALENDAR_ALARM_NONE = -1,
    CALENDAR_ALARM_TIME_UNIT_SPECIFIC = 1,  // an alarm at a time of its own, no count of units
    CALENDAR_ALARM_TIME_UNIT_MINUTE = 60,
    CALENDAR_ALARM_TIME_UNIT_HOUR = 3600,
    CALENDAR_ALARM_TIME_UNIT_DAY = 86400,
    CALENDAR_ALARM_TIME_UNIT_WEEK = 604800,
} calendar_alarm_time_unit_e;

typedef enum {  // _calendar_updated_info.modified_status
    CALENDAR_RECORD_MODIFIED_STATUS_INSERTED = 0,
    CALENDAR_RECORD_MODIFIED_STATUS_UPDATED = 1,
    CALENDAR_RECORD_MODIFIED_STATUS_DELETED = 2,
} calendar_record_modified_status_e;

#define CALENDAR_RECORD_NO_COORDINATE 1000.0  // latitude or longitude of an event without a place

// ---- Views
// ----------------------------------------------------------------------------------------
//
// One constant structure per view: the view's URI and the id of each property. The letter names the
// property's type: (i) int, (s) text, (d) double, (t) calendar_time_s, (c) child records.

struct calendar_book_view {
    const char *_uri;
    unsigned int id;           // (i) given by the insert
    unsigned int name;         // (s)
    unsigned int description;  // (s)
    unsigned int account_id;   // (i)
    unsigned int store_type;   // (i) calendar_book_type_e
};

struct calendar_event_view {
    const char *_uri;
    unsigned int id;                 // (i) given by the insert
    unsigned int calendar_book_id;   // (i)
    unsigned int summary;            // (s)
    unsigned int description;        // (s)
    unsigned int location;           // (s)
    unsigned int sensitivity;        // (i) 0 public
    unsigned int latitude;           // (d) degrees; 1000.0 is none
    unsigned int longitude;          // (d) degrees; 1000.0 is none
    unsigned int organizer_name;     // (s)
    unsigned int organizer_email;    // (s)
    unsigned int start_time;         // (t)
    unsigned int start_tzid;         // (s) Olson zone id
    unsigned int end_time;           // (t)
    unsigned int end_tzid;           // (s) Olson zone id
    unsigned int freq;               // (i) calendar_recurrence_frequency_e
    unsigned int range_type;         // (i) calendar_range_type_e, none by default
    unsigned int until_time;         // (t)
    unsigned int count;              // (i)
    unsigned int interval;           // (i) 1 by default
    unsigned int bysecond;           // (s) the BY lists as RFC 5545 3.3.10 writes them
    unsigned int byminute;           // (s)
    unsigned int byhour;             // (s)
    unsigned int byday;              // (s)
    unsigned int bymonthday;         // (s)
    unsigned int byyearday;          // (s)
    unsigned int byweekno;           // (s)
    unsigned int bymonth;            // (s)
    unsigned int bysetpos;           // (s)
    unsigned int wkst;               // (i) calendar_days_of_week_e; 0 is none
    unsigned int exdate;             // (s) cancelled occurrences, separated by commas
    unsigned int recurrence_id;      // (s) the occurrence that an exception stands for
    unsigned int original_event_id;  // (i) the parent of an exception; 0 for any other event
    unsigned int has_alarm;       // (i) 1 while the event has alarm children, kept by the service
    unsigned int calendar_alarm;  // (c) _calendar_alarm records, in order
    unsigned int exception;       // (c) _calendar_event records, read only
};

// To-do records can be made and filled; the store keeps events and books only.
struct calendar_todo_view {
    const char *_uri;
    unsigned int id;                // (i)
    unsigned int calendar_book_id;  // (i)
    unsigned int summary;           // (s)
    unsigned int start_time;        // (t)
    unsigned int start_tzid;        // (s)
    unsigned int latitude;          // (d)
    unsigned int longitude;         // (d)
    unsigned int freq;              // (i)
    unsigned int range_type;        // (i)
    unsigned int until_time;        // (t)
    unsigned int count;             // (i)
    unsigned int interval;          // (i)
};

struct calendar_alarm_view {
    const char *_uri;
    unsigned int tick;       // (i) count of units before the start
    unsigned int tick_unit;  // (i) calendar_alarm_time_unit_e
};

struct calendar_updated_info_view {
    const char *_uri;
    unsigned int id;                // (i) event id
    unsigned int modified_status;   // (i) calendar_record_modified_status_e
    unsigned int calendar_book_id;  // (i)
    unsigned int version;           // (i) version of the event's latest change
};

extern const struct calendar_book_view _calendar_book;
extern const struct calendar_event_view _calendar_event;
extern const struct calendar_todo_view _calendar_todo;
extern const struct calendar_alarm_view _calendar_alarm;
extern const struct calendar_updated_info_view _calendar_updated_info;

// ---- Handles
// --------------------------------------------------------------------------------------

typedef struct calendar_record *calendar_record_h;
typedef struct calendar_list *calendar_list_h;
typedef struct calendar_query *calendar_query_h;
typedef struct calendar_filter *calendar_filter_h;

// ---- Connection
// -----------------------------------------------------------------------------------

// Opens the device's calendar store, creating it when absent; the store's folder must exist.
// Connecting again while connected succeeds and changes nothing.
int calendar_connect(void);

// Closes the store and drops every subscription of this process: no callback runs once this has
// returned, on the thread that runs the subscription's main context. Records and lists stay valid.
int calendar_disconnect(void);

// ---- Records
// --------------------------------------------------------------------------------------

// Makes an empty record of a view. The caller owns it: calendar_record_destroy().
int calendar_record_create(const char *view_uri, calendar_record_h *out_record);

// Frees a record; with destroy_children its child records too. Without it the children pass to
// whoever holds them.
int calendar_record_destroy(calendar_record_h record, bool destroy_children);

// The view's URI, borrowed; valid for the life of the process.
int calendar_record_get_uri_p(calendar_record_h record, const char **out_uri);

int calendar_record_get_int(calendar_record_h record, unsigned int property_id, int *out_value);
int calendar_record_get_double(calendar_record_h record, unsigned int property_id,
                               double *out_value);
int calendar_record_get_caltime(calendar_record_h record, unsigned int property_id,
                                calendar_time_s *out_value);

// The text, borrowed until the property is set or the record destroyed; null (with success) for an
// unset text.
int calendar_record_get_str_p(calendar_record_h record, unsigned int property_id, char **out_text);

int calendar_record_set_int(calendar_record_h record, unsigned int property_id, int value);
int calendar_record_set_double(calendar_record_h record, unsigned int property_id, double value);
int calendar_record_set_caltime(calendar_record_h record, unsigned int property_id,
                                calendar_time_s value);

// Copies the text; a null text unsets the property.
int calendar_record_set_str(calendar_record_h record, unsigned int property_id, const char *text);

// Appends a child, which the record then owns. Exceptions are records of their own: adding one
// under _calendar_event.exception fails.
int calendar_record_add_child_record(calendar_record_h record, unsigned int property_id,
                                     calendar_record_h child);
int calendar_record_get_child_record_count(calendar_record_h record, unsigned int property_id,
                                           int *out_count);

// The child at an index from 0, borrowed from the record.
int calendar_record_get_child_record_at_p(calendar_record_h record, unsigned int property_id,
                                          int index, calendar_record_h *out_child);

// ---- Lists
// ----------------------------------------------------------------------------------------

int calendar_list_get_count(calendar_list_h list, int *out_count);
int calendar_list_first(calendar_list_h list);  // CALENDAR_ERROR_NO_DATA when the list is empty
int calendar_list_next(calendar_list_h list);   // CALENDAR_ERROR_NO_DATA past the last record

// The record at the current position, borrowed from the list.
int calendar_list_get_current_record_p(calendar_list_h list, calendar_record_h *out_record);

// Frees a list; with destroy_records its records (and their children) too.
int calendar_list_destroy(calendar_list_h list, bool destroy_records);

// ---- Queries
// --------------------------------------------------------------------------------------

typedef enum { CALENDAR_MATCH_EQUAL = 0 } calendar_match_int_flag_e;
typedef enum {
    CALENDAR_FILTER_OPERATOR_AND = 0,
    CALENDAR_FILTER_OPERATOR_OR = 1
} calendar_filter_operator_e;

int calendar_query_create(const char *view_uri, calendar_query_h *out_query);
int calendar_query_destroy(calendar_query_h query);

// Uses a copy of the filter; the caller keeps the filter. Its view must be the query's.
int calendar_query_set_filter(calendar_query_h query, calendar_filter_h filter);

// A filter is conditions with an operator between each two: condition, operator, condition.
// Integer equality and the and-operator are offered; CALENDAR_ERROR_NOT_SUPPORTED otherwise.
int calendar_filter_create(const char *view_uri, calendar_filter_h *out_filter);
int calendar_filter_destroy(calendar_filter_h filter);
int calendar_filter_add_int(calendar_filter_h filter, unsigned int property_id,
                            calendar_match_int_flag_e match, int value);
int calendar_filter_add_operator(calendar_filter_h filter, calendar_filter_operator_e op);

// Books or events that match, ordered by id, from the offset-th on, at most limit (0: all). Events
// come with their alarms and without exceptions. The caller owns the list.
int calendar_db_get_records_with_query(calendar_query_h query, int offset, int limit,
                                       calendar_list_h *out_list);

// ---- Store
// ----------------------------------------------------------------------------------------
//
// A write call is atomic and durable when it returns; it makes one change version, one above the
// last. An exception's writes change its parent too, with the same version.

// Stores a new book, or a new event with its alarms, and gives its id (out_id may be null). The
// record stays the caller's. Fails when an event's book or parent does not exist.
int calendar_db_insert_record(calendar_record_h record, int *out_id);

// A book or event with all its children. The caller owns it.
int calendar_db_get_record(const char *view_uri, int id, calendar_record_h *out_record);

// Writes everything that the record holds, its alarms included, over the stored record of its id.
// Exceptions are left alone, but go along when their parent moves to another book.
int calendar_db_update_record(calendar_record_h record);

// Writes the record in place of the stored one, keeping the id, and keeping the book and the parent
// where the new record does not set them.
int calendar_db_replace_record(calendar_record_h record, int id);

// Deletes a book with its events, or an event with its exceptions.
int calendar_db_delete_record(const char *view_uri, int id);

int calendar_db_get_current_version(int *out_version);

// The version of the latest write of the calling thread; 0 when it has not written.
int calendar_db_get_last_change_version(int *out_version);

// The changes of a book after a version, as _calendar_updated_info records ordered by version: one
// per event, its latest change only, deleted events included. Within one version parents come
// before their exceptions, but deleted exceptions before their parent. An event that moved to
// another book is listed as deleted here. The latest 100,000 deleted events stay listed; older ones
// are dropped when a process connects. The caller owns the list, which may be empty.
// out_current_version is the store's version at the same moment.
int calendar_db_get_changes_by_version(const char *view_uri, int calendar_book_id, int version,
                                       calendar_list_h *out_list, int *out_current_version);

// ---- Notification
// ---------------------------------------------------------------------------------

typedef void (*calendar_db_changed_cb)(const char *view_uri, void *user_data);

// Subscribes to changes of a view, made by any process. The callback runs on the GLib main context
// that is the calling thread's default at this call, once soon after subscribing and then once per
// burst of changes. Subscribing the same callback and user data twice is an error
// (CALENDAR_ERROR_INVALID_PARAMETER); removing what was not subscribed is CALENDAR_ERROR_NO_DATA.
int calendar_db_add_changed_cb(const char *view_uri, calendar_db_changed_cb callback,
                               void *user_data);
int calendar_db_remove_changed_cb(const char *view_uri, calendar_db_changed_cb callback,
                                  void *user_data);

#ifdef __cplusplus
}
#endif

// NOLINTEND(modernize-use-using, modernize-deprecated-headers)

#endif  // QOR_PLATFORM_CALENDAR_SERVICE_H
