// SPDX-License-Identifier: Apache-2.0
//
// Entry points: which items changed or were deleted on the device, and the notification of it. The
// id queries read the pending change list without the adapter mutex; the change handler, on the
// main loop, holds it only while it replaces that list, and calls the host without it.
#include <glib.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/qor_adapter_data_sync_calendar_event_state.h"

namespace {

constexpr size_t kIdSize = 30;

// One change of the pending list.
struct Change {
    int event_id;
    int status;
    int book_id;  // not used: the list holds the adapter's own book only
    int version;
};

bool read_change(calendar_record_h record, Change* change) {
    return calendar_record_get_int(record, _calendar_updated_info.id, &change->event_id) == 0 &&
           calendar_record_get_int(record, _calendar_updated_info.modified_status,
                                   &change->status) == 0 &&
           calendar_record_get_int(record, _calendar_updated_info.calendar_book_id,
                                   &change->book_id) == 0 &&
           calendar_record_get_int(record, _calendar_updated_info.version, &change->version) == 0;
}

// The ids that a query collects, as texts for the host.
class IdList {
  public:
    IdList() = default;
    IdList(const IdList&) = delete;
    IdList& operator=(const IdList&) = delete;
    ~IdList() { g_list_free_full(first_, free); }

    void add(int32_t id) {
        char text[kIdSize] = {};
        static_cast<void>(snprintf(text, sizeof(text), "%d", id));
        GList* const end = g_list_append(last_, strdup(text));
        first_ = first_ != nullptr ? first_ : end;
        last_ = last_ != nullptr ? last_->next : end;
        failed_ = failed_ || last_->data == nullptr;
    }

    bool empty() const { return first_ == nullptr; }

    // Hands the texts over to a new array. False when memory has run out.
    bool give(char*** ids, int* count) {
        const guint length = g_list_length(first_);
        auto** const array = static_cast<char**>(calloc(length, sizeof(char*)));
        if (failed_ || array == nullptr) {
            free(array);
            return false;
        }
        char** next = array;
        for (GList* entry = first_; entry != nullptr; entry = entry->next) {
            *next++ = static_cast<char*>(entry->data);
            entry->data = nullptr;
        }
        *ids = array;
        *count = static_cast<int>(length);
        return true;
    }

  private:
    GList* first_ = nullptr;
    GList* last_ = nullptr;
    bool failed_ = false;  // a text could not be allocated
};

// Makes the map row of an event, or of an occurrence of one: its item number, or 0 on failure.
int32_t create_row(int32_t event_id, int32_t parent_id, int32_t status, char* exdate) {
    calendar_adapter_row row = {};
    row.calsvc_id = event_id;
    row.calsvc_ori_id = parent_id;
    row.exception_status = status;
    row.exdate = exdate;  // borrowed: the row is not released
    row.calendar_id = calendar_adapter->calendar_id;
    return _qor_calendar_db_insert_adapter(&row) == 0 ? row.adapter_id : 0;
}

// Collects a changed event. Null when that is all there is to tell of it: its occurrences are
// looked at once it has a row, and only if it is not itself an occurrence of another event.
Record collect_event(int event_id, IdList* ids) {
    const int32_t id = _qor_calendar_db_get_id_from_adapter_db(event_id);
    Record event = read_event(event_id);
    if (id < 1) {
        ids->add(create_row(event_id, 0, 0, nullptr));  // Deliberate: "0" when there is no row.
        return nullptr;
    }
    ids->add(id);
    int parent_id = 0;
    static_cast<void>(  // an event that cannot be read has no parent, and no occurrences either
        calendar_record_get_int(event.get(), _calendar_event.original_event_id, &parent_id));
    return parent_id < 1 ? std::move(event) : nullptr;
}

int count_exceptions(calendar_record_h event) {
    int count = 0;
    return event != nullptr && calendar_record_get_child_record_count(
                                   event, _calendar_event.exception, &count) == 0
               ? count
               : 0;
}

// An occurrence that was changed. False when the child cannot be fetched.
bool collect_exception(calendar_record_h event, int event_id, int index, IdList* ids) {
    calendar_record_h child = nullptr;
    if (calendar_record_get_child_record_at_p(event, _calendar_event.exception, index, &child) !=
        0) {
        return false;
    }
    int child_id = 0;
    static_cast<void>(calendar_record_get_int(child, _calendar_event.id, &child_id));  // 0: no row
    int32_t id = _qor_calendar_db_get_id_from_adapter_db(child_id);
    if (id < 1) {
        id = create_row(child_id, event_id, 1, nullptr);
    }
    if (id > 0) {
        ids->add(id);
    }
    return true;
}

// The occurrences that were cancelled. Pieces of the list are taken as they stand, blanks included.
void collect_excluded_dates(calendar_record_h event, int event_id, IdList* ids) {
    char* exdate = nullptr;
    if (event == nullptr ||
        calendar_record_get_str_p(event, _calendar_event.exdate, &exdate) != 0 ||
        exdate == nullptr || *exdate == '\0') {
        return;
    }
    const GTexts dates(g_strsplit(exdate, ",", 0));
    for (char** date = dates.get(); *date != nullptr; ++date) {
        int32_t id = _qor_calendar_db_get_id_with_exdate(event_id, *date);
        if (id < 1) {
            id = create_row(0, event_id, 2, *date);
        }
        if (id > 0) {
            ids->add(id);
        }
    }
}

int give_no_ids(int* count) {
    *count = 0;
    __qor_calendar_event_release_memory();
    return kNoIds;
}

bool is_own_or_deleted(const Change& change) {
    int32_t own_version = 0;
    static_cast<void>(  // an event that the adapter never wrote keeps 0
        _qor_calendar_db_get_version(change.event_id, &own_version, QOR_EVENT_TABLE));
    return own_version == change.version ||
           change.status == CALENDAR_RECORD_MODIFIED_STATUS_DELETED;
}

// A deleted event, then every occurrence derived from it. Their rows are gone afterwards.
void collect_deleted(const Change& change, IdList* ids) {
    int32_t own_version = -1;
    static_cast<void>(  // an event that the adapter never wrote keeps -1
        _qor_calendar_db_get_version(change.event_id, &own_version, QOR_EVENT_TABLE));
    if (own_version == change.version || change.status != CALENDAR_RECORD_MODIFIED_STATUS_DELETED) {
        return;
    }
    const int32_t id = _qor_calendar_db_get_id_from_adapter_db(change.event_id);
    if (id == 0) {
        return;
    }
    ids->add(id);  // Deliberate: an event that never was an item is told as "-1".
    GList* rows = nullptr;
    static_cast<void>(  // without a list nothing derived is told
        _qor_calendar_db_get_exdate_adapter_id_list(change.event_id, -1, &rows));
    for (const GList* entry = rows; entry != nullptr; entry = entry->next) {
        auto* const row = static_cast<calendar_adapter_row*>(entry->data);
        ids->add(row->adapter_id);
        _qor_calendar_free_adapter_row(row);
        free(row);
    }
    g_list_free(rows);
    static_cast<void>(_qor_calendar_db_delete_adapter(id));  // a row that stays is told again
}

// Goes to the first record and counts them all. Null, or what to say when they cannot be counted.
const char* rewind(calendar_list_h list, int* count) {
    if (calendar_list_get_count(list, count) != 0) {
        return "calendar_list_get_count fail";
    }
    static_cast<void>(calendar_list_first(list));  // an empty list has no first record
    return nullptr;
}

// Reads the current record and moves on. Null, or what to say when it cannot be read.
const char* take_change(calendar_list_h list, Change* change) {
    calendar_record_h record = nullptr;  // borrowed
    const char* message = nullptr;
    if (calendar_list_get_current_record_p(list, &record) != 0) {
        message = "calendar_list_get_count fail";  // Deliberate: the text of counting.
    } else if (!read_change(record, change)) {
        message = "calendar_record_get_int fail";
    }
    static_cast<void>(calendar_list_next(list));  // fails past the last record
    return message;
}

void set_baseline(calendar_adapter_state* state) {
    state->version = state->current_version;
    static_cast<void>(  // the next baseline is written anew; changes may be told twice until then
        _qor_calendar_db_update_calendar_version(state->version));
}

}  // namespace

// ---- Change detection
// ------------------------------------------------------------------------------

int qor_adapter_data_sync_get_dirty_ids_p(char*** ids, int* count) noexcept {
    if (ids == nullptr || count == nullptr) {
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    calendar_list_h list = calendar_adapter->change_list;
    if (list == nullptr) {
        *count = 0;
        return kSuccess;
    }
    IdList collected;
    int length = 0;
    const char* message = rewind(list, &length);
    for (int i = 0; message == nullptr && i < length; ++i) {
        Change change = {};
        message = take_change(list, &change);
        if (message != nullptr || is_own_or_deleted(change)) {
            continue;
        }
        const Record event = collect_event(change.event_id, &collected);
        const int children = count_exceptions(event.get());
        for (int child = 0; child < children; ++child) {
            if (!collect_exception(event.get(), change.event_id, child, &collected)) {
                QOR_LOG(CRITICAL, "get_child_record fail. %d,%d", change.event_id, child);
            }
        }
        collect_excluded_dates(event.get(), change.event_id, &collected);
    }
    if (message != nullptr) {
        QOR_LOG(CRITICAL, "%s", message);
        return kFailure;
    }
    if (collected.empty()) {
        return give_no_ids(count);
    }
    if (!collected.give(ids, count)) {
        QOR_LOG(CRITICAL, "calloc fail");
        return kFailure;
    }
    __qor_calendar_event_release_memory();
    return kSuccess;
}

int qor_adapter_data_sync_get_deleted_ids_p(char*** ids, int* count) noexcept {
    if (ids == nullptr || count == nullptr) {
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    calendar_list_h list = calendar_adapter->change_list;
    if (list == nullptr) {
        *count = 0;
        return kSuccess;
    }
    IdList collected;
    int length = 0;
    const char* message = rewind(list, &length);
    for (int i = 0; message == nullptr && i < length; ++i) {
        Change change = {};
        message = take_change(list, &change);
        if (message == nullptr) {
            collect_deleted(change, &collected);
        }
    }
    if (message != nullptr) {
        QOR_LOG(CRITICAL, "%s", message);
        return kFailure;
    }
    if (collected.empty()) {
        return give_no_ids(count);
    }
    if (!collected.give(ids, count)) {
        QOR_LOG(CRITICAL, "calloc fail");
        return kFailure;
    }
    __qor_calendar_event_release_memory();
    return kSuccess;
}

int qor_adapter_data_sync_clear_deleted_ids(void) noexcept {
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    drop_change_list(calendar_adapter);
    static_cast<void>(  // versions that stay are pruned with the next ones
        _qor_calendar_db_delete_version(calendar_adapter->current_version, QOR_EVENT_TABLE));
    set_baseline(calendar_adapter);
    __qor_calendar_event_release_memory();
    return kSuccess;
}

int qor_adapter_data_sync_clear_dirty_ids(void) noexcept {
    return kSuccess;
}

// ---- Notification
// ----------------------------------------------------------------------------------

int qor_adapter_data_sync_set_data_changed_cb(data_changed_callback callback,
                                              void* user_data) noexcept {
    QOR_LOG(INFO, "");
    if (callback == nullptr) {
        return kNullCallback;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    const int error =
        calendar_db_add_changed_cb(_calendar_event._uri, __is_calendar_changes, calendar_adapter);
    if (error != 0) {
        QOR_LOG(CRITICAL, "add_changed_cb fail");
        return error;
    }
    calendar_adapter->data_changed_cb = callback;
    calendar_adapter->data_changed_user_data = user_data;
    return kSuccess;
}

int qor_adapter_data_sync_unset_data_changed_cb(void) noexcept {
    QOR_LOG(INFO, "");
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    static_cast<void>(  // not being subscribed is what is wanted
        calendar_db_remove_changed_cb(_calendar_event._uri, __is_calendar_changes,
                                      calendar_adapter));
    calendar_adapter->data_changed_cb = nullptr;
    return kSuccess;
}

void __is_calendar_changes(const char* /*view_uri*/, void* user_data) {
    auto* const state = static_cast<calendar_adapter_state*>(user_data);
    // A call that comes after deinitialising, or before the callback is stored, does nothing.
    if (state == nullptr || state != calendar_adapter || state->data_changed_cb == nullptr) {
        return;
    }
    {
        const AdapterLock lock;
        drop_change_list(state);
        static_cast<void>(  // a failed fetch leaves no list
            calendar_db_get_changes_by_version(_calendar_event._uri, state->calendar_id,
                                               state->version, &state->change_list,
                                               &state->current_version));
    }
    if (state->change_list == nullptr) {
        if (state->current_version > state->version) {
            set_baseline(state);
        }
        return;
    }
    int length = 0;
    if (const char* message = rewind(state->change_list, &length)) {
        QOR_LOG(CRITICAL, "%s", message);
        return;  // the list stays pending: changes that cannot be counted may be foreign
    }
    for (int i = 0; i < length; ++i) {
        Change change = {};
        if (const char* message = take_change(state->change_list, &change)) {
            QOR_LOG(CRITICAL, "%s", message);
            continue;
        }
        int32_t own_version = 0;
        static_cast<void>(  // an event that the adapter never wrote keeps 0
            _qor_calendar_db_get_version(change.event_id, &own_version, QOR_EVENT_TABLE));
        if (own_version != change.version) {
            state->data_changed_cb(state->data_changed_user_data);
            return;
        }
    }
    drop_change_list(state);
    set_baseline(state);  // Deliberate: unconditionally, unlike after a fetch without a list.
}
