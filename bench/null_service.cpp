// SPDX-License-Identifier: Apache-2.0
#include "bench/null_service.h"

#include <sqlite3.h>

#include <array>
#include <utility>

#include "bench/document_floor.h"
#include "common/device.h"

// ---- Views: properties are numbered from 0 ------------------------------------------------------

// clang-format off
const calendar_book_view _calendar_book = {"null.book", 0, 1, 2, 3, 4};
const calendar_event_view _calendar_event = {
    "null.event", 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17,
    18, 19, 20, 21, 22, 23, 24, 25, 26, 27, 28, 29, 30, 31, 32, 33, 34};
const calendar_alarm_view _calendar_alarm = {"null.alarm", 0, 1};
const calendar_updated_info_view _calendar_updated_info = {"null.updated_info", 0, 1, 2, 3};
// clang-format on

struct calendar_record {
    const char* uri;
    const int* numbers;  // by property
};

struct calendar_list {
    std::vector<NullChange> changes;
    size_t at = 0;
    calendar_record current = {};
};

namespace {

constexpr size_t kProperties = 35;

long calls = 0;
int last_id = 0;
int last_version = 0;
calendar_list change_list;
calendar_db_changed_cb changed_callback = nullptr;
void* changed_user_data = nullptr;

// ---- What every record holds --------------------------------------------------------------------

std::array<int, kProperties> event_numbers() {
    std::array<int, kProperties> numbers{};
    numbers[_calendar_event.id] = 1;
    numbers[_calendar_event.freq] = CALENDAR_RECURRENCE_WEEKLY;
    numbers[_calendar_event.interval] = 1;
    numbers[_calendar_event.wkst] = CALENDAR_MONDAY;
    numbers[_calendar_event.range_type] = CALENDAR_RANGE_UNTIL;
    numbers[_calendar_event.has_alarm] = 1;
    return numbers;
}

std::array<const char*, kProperties> event_texts() {
    std::array<const char*, kProperties> texts{};
    texts[_calendar_event.summary] = kFloorTitle;
    texts[_calendar_event.location] = kFloorLocation;
    texts[_calendar_event.description] = kFloorDescription;
    texts[_calendar_event.start_tzid] = kFloorZone;
    texts[_calendar_event.end_tzid] = kFloorZone;
    texts[_calendar_event.byday] = kFloorDays;
    texts[_calendar_event.organizer_name] = kFloorOrganizer;
    texts[_calendar_event.organizer_email] = kFloorOrganizer;
    return texts;
}

std::array<int64_t, kProperties> event_times() {
    std::array<int64_t, kProperties> times{};
    times[_calendar_event.start_time] = kFloorStart;
    times[_calendar_event.end_time] = kFloorEnd;
    times[_calendar_event.until_time] = kFloorUntil;
    return times;
}

std::array<double, kProperties> event_degrees() {
    std::array<double, kProperties> degrees{};
    degrees[_calendar_event.longitude] = kFloorLongitude;
    degrees[_calendar_event.latitude] = kFloorLatitude;
    return degrees;
}

const std::array<int, kProperties> numbers_of_event = event_numbers();
const std::array<const char*, kProperties> texts_of_event = event_texts();
const std::array<int64_t, kProperties> times_of_event = event_times();
const std::array<double, kProperties> degrees_of_event = event_degrees();
constexpr int kNumbersOfAlarms[kFloorAlarms][2] = {
    {kFloorMinutes[0], CALENDAR_ALARM_TIME_UNIT_MINUTE},
    {kFloorMinutes[1], CALENDAR_ALARM_TIME_UNIT_MINUTE}};

calendar_record event{_calendar_event._uri, numbers_of_event.data()};
calendar_record alarms[] = {{_calendar_alarm._uri, kNumbersOfAlarms[0]},
                            {_calendar_alarm._uri, kNumbersOfAlarms[1]}};

// Success, counted.
int done() {
    ++calls;
    return CALENDAR_ERROR_NONE;
}

template <typename T>
int give(T value, T* out) {
    *out = value;
    return done();
}

}  // namespace

void null_service_reset(int last) {
    last_id = last;
    last_version = last;
}
void null_service_set_changes(std::vector<NullChange> changes) {
    change_list.changes = std::move(changes);
}
void null_service_notify() {
    changed_callback(_calendar_event._uri, changed_user_data);
}
long null_service_calls() {
    return calls;
}

// ---- Records and lists --------------------------------------------------------------------------

int calendar_connect() {
    return done();
}
int calendar_disconnect() {
    return done();
}
int calendar_record_create(const char* view_uri, calendar_record_h* out_record) {
    return give(view_uri == _calendar_alarm._uri ? &alarms[0] : &event, out_record);
}
int calendar_record_destroy(calendar_record_h, bool) {
    return done();
}
int calendar_record_get_uri_p(calendar_record_h record, const char** out_uri) {
    return give(record->uri, out_uri);
}
int calendar_record_get_int(calendar_record_h record, unsigned int property, int* out_value) {
    return give(record->numbers[property], out_value);
}
int calendar_record_get_double(calendar_record_h, unsigned int property, double* out_value) {
    return give(degrees_of_event[property], out_value);
}
int calendar_record_get_caltime(calendar_record_h, unsigned int property,
                                calendar_time_s* out_value) {
    out_value->type = CALENDAR_TIME_UTIME;
    return give(times_of_event[property], &out_value->time.utime);
}
int calendar_record_get_str_p(calendar_record_h, unsigned int property, char** out_text) {
    return give(const_cast<char*>(texts_of_event[property]), out_text);
}
int calendar_record_set_int(calendar_record_h, unsigned int, int) {
    return done();
}
int calendar_record_set_double(calendar_record_h, unsigned int, double) {
    return done();
}
int calendar_record_set_caltime(calendar_record_h, unsigned int, calendar_time_s) {
    return done();
}
int calendar_record_set_str(calendar_record_h, unsigned int, const char*) {
    return done();
}
int calendar_record_add_child_record(calendar_record_h, unsigned int, calendar_record_h) {
    return done();
}
int calendar_record_get_child_record_count(calendar_record_h, unsigned int property,
                                           int* out_count) {
    return give(property == _calendar_event.calendar_alarm ? kFloorAlarms : 0, out_count);
}
int calendar_record_get_child_record_at_p(calendar_record_h, unsigned int, int index,
                                          calendar_record_h* out_child) {
    return give(&alarms[index], out_child);
}
int calendar_list_get_count(calendar_list_h list, int* out_count) {
    return give(static_cast<int>(list->changes.size()), out_count);
}
int calendar_list_first(calendar_list_h list) {
    list->at = 0;
    return done();
}
int calendar_list_next(calendar_list_h list) {
    ++list->at;
    return done();
}
int calendar_list_get_current_record_p(calendar_list_h list, calendar_record_h* out_record) {
    list->current.numbers = list->changes[list->at].data();
    return give(&list->current, out_record);
}
int calendar_list_destroy(calendar_list_h, bool) {
    return done();
}

// ---- Store --------------------------------------------------------------------------------------

int calendar_query_create(const char*, calendar_query_h* out_query) {
    return give<calendar_query_h>(nullptr, out_query);
}
int calendar_query_destroy(calendar_query_h) {
    return done();
}
int calendar_query_set_filter(calendar_query_h, calendar_filter_h) {
    return done();
}
int calendar_filter_create(const char*, calendar_filter_h* out_filter) {
    return give<calendar_filter_h>(nullptr, out_filter);
}
int calendar_filter_destroy(calendar_filter_h) {
    return done();
}
int calendar_filter_add_int(calendar_filter_h, unsigned int, calendar_match_int_flag_e, int) {
    return done();
}
int calendar_filter_add_operator(calendar_filter_h, calendar_filter_operator_e) {
    return done();
}
int calendar_db_get_records_with_query(calendar_query_h, int, int, calendar_list_h* out_list) {
    static calendar_list books{{{kNullBook}}};  // a book's first property is its id
    return give(&books, out_list);
}
int calendar_db_insert_record(calendar_record_h, int* out_id) {
    ++last_version;
    return give(++last_id, out_id);
}
int calendar_db_get_record(const char*, int, calendar_record_h* out_record) {
    return give(&event, out_record);
}
int calendar_db_update_record(calendar_record_h) {
    ++last_version;
    return done();
}
int calendar_db_replace_record(calendar_record_h, int) {
    ++last_version;
    return done();
}
int calendar_db_delete_record(const char*, int) {
    ++last_version;
    return done();
}
int calendar_db_get_current_version(int* out_version) {
    return give(last_version, out_version);
}
int calendar_db_get_last_change_version(int* out_version) {
    return give(last_version, out_version);
}
int calendar_db_get_changes_by_version(const char*, int, int, calendar_list_h* out_list,
                                       int* out_current_version) {
    *out_current_version = last_version;
    return give(&change_list, out_list);
}
int calendar_db_add_changed_cb(const char*, calendar_db_changed_cb callback, void* user_data) {
    changed_callback = callback;
    changed_user_data = user_data;
    return done();
}
int calendar_db_remove_changed_cb(const char*, calendar_db_changed_cb, void*) {
    changed_callback = nullptr;
    return done();
}

// ---- The other services -------------------------------------------------------------------------

int account_connect() {
    return done();
}
int account_disconnect() {
    return done();
}
int account_foreach_account_from_db(account_cb, void*) {
    return done();
}
int account_get_user_name(account_h, char**) {
    return ACCOUNT_ERROR_NO_DATA;
}
int db_util_open(const char* path, sqlite3** out_db, int) {
    return sqlite3_open(path, out_db);
}
int db_util_close(sqlite3* db) {
    return sqlite3_close(db);
}
int __dlog_print(int, int, const char*, const char*, ...) {
    return 0;
}
