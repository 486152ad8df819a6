// SPDX-License-Identifier: Apache-2.0
//
// Event store operations and pending exceptions. State: the id of the exception retry timer.
#include "data-sync/calendar/qor_adapter_data_sync_calendar_event_svc.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"

namespace {

constexpr guint kRetrySeconds = 60;
constexpr size_t kExdateSize = 2048;

constexpr int32_t kChanged = 1;    // exception_status of a changed occurrence
constexpr int32_t kCancelled = 2;  // and of a cancelled one

// 0 when no timer is pending. The callback clears it before it takes the adapter mutex.
std::atomic<guint> retry_timer = 0;

// Notes that the calling thread's latest write of the calendar was the adapter's own, to this
// event.
void record_version(int32_t event_id, int32_t version) {
    static_cast<void>(  // a lost version is told to the host once as a change
        _qor_calendar_db_insert_version(event_id, version, QOR_EVENT_TABLE));
}

int32_t last_change_version() {
    int version = 0;
    static_cast<void>(calendar_db_get_last_change_version(&version));  // 0 matches no change
    return version;
}

// The occurrence that a cancelled instance stands for (borrowed from its record) and the parent
// event.
bool fetch_parent(calendar_record_h record, int32_t parent_id, char** recurrence_id,
                  Record* parent) {
    calendar_record_h fetched = nullptr;
    if (calendar_record_get_str_p(record, _calendar_event.recurrence_id, recurrence_id) != 0 ||
        *recurrence_id == nullptr ||
        calendar_db_get_record(_calendar_event._uri, parent_id, &fetched) != 0) {
        return false;
    }
    parent->reset(fetched);
    return true;
}

// Enters an occurrence in the parent's list of cancelled ones, after the separator. False when the
// list cannot be set or would not fit: a list is never cut, and stays as it was.
bool append_exdate(calendar_record_h parent, const char* old_list, const char* separator,
                   const char* occurrence) {
    char list[kExdateSize] = {};
    const bool first = old_list == nullptr || *old_list == '\0';
    const int length = snprintf(list, sizeof(list), "%s%s%s", first ? "" : old_list,
                                first ? "" : separator, occurrence);
    return length >= 0 && static_cast<size_t>(length) < sizeof(list) &&
           calendar_record_set_str(parent, _calendar_event.exdate, list) == 0;
}

// The parent's list of cancelled occurrences, borrowed. False when it cannot be read.
bool read_exdate(calendar_record_h parent, char** list) {
    return calendar_record_get_str_p(parent, _calendar_event.exdate, list) == 0;
}

// Stores the parent. Deliberate: only a failed update destroys its record; an updated one is kept.
bool update_and_keep(Record parent) {
    if (calendar_db_update_record(parent.get()) != 0) {
        return false;
    }
    static_cast<void>(parent.release());
    return true;
}

// Inserts the row's record as an event of the adapter's book. False when the service refuses it.
bool insert_event(calendar_record_h record, int32_t book_id, int32_t* event_id) {
    return calendar_record_set_int(record, _calendar_event.calendar_book_id, book_id) == 0 &&
           calendar_db_insert_record(record, event_id) == 0;
}

// A write that failed leaves a pending row, so that the host still has a number for the item.
int keep_failed_row(calendar_adapter_row* row) {
    row->calsvc_id = 0;
    row->invalid = 1;
    static_cast<void>(_qor_calendar_db_insert_adapter(row));  // the item is then told as "0"
    return kError;
}

void store_applied_row(calendar_adapter_row* row, int32_t event_id) {
    row->calsvc_id = event_id;
    for (char** text : {&row->value, &row->ori_cloud_key}) {
        free(*text);
        *text = nullptr;
    }
    static_cast<void>(_qor_calendar_db_insert_adapter(row));  // shows in the row's adapter_id
}

// Runs the retry 60 seconds after the latest insert.
void arm_retry_timer() {
    const guint pending = retry_timer;
    if (pending != 0) {
        g_source_remove(pending);
    }
    retry_timer =
        g_timeout_add_seconds(kRetrySeconds, __qor_calendar_event_svc_insert_change, nullptr);
}

// A pending document parsed into a working row with a record of its own. Null, or what to say.
const char* parse_pending(const char* document, OwnedRow* working) {
    if (calendar_record_create(_calendar_event._uri, &working->record) != 0) {
        return "record_create fail";
    }
    const int result =
        _qor_calendar_parse_event_from_json(document, 0, strlen(document), 0, working);
    if (working->invalid == 1) {
        return "get svc_id fail!";
    }
    return result != 0 ? "parse_event_from_json fail" : nullptr;
}

// Whether the host knows the parent's cloud key, and the parent's event (0 when it has none).
bool find_parent(const char* cloud_key, int32_t* event_id) {
    const MallocText item_id(_qor_calendar_db_get_adapter_id_from_server(cloud_key));
    if (!item_id) {
        return false;
    }
    const auto adapter_id = static_cast<int32_t>(strtol(item_id.get(), nullptr, 10));
    static_cast<void>(_qor_calendar_db_get_svc_id(adapter_id, event_id));  // no row leaves 0
    return true;
}

// Applies a pending changed occurrence. Null, or what to say; silent while the parent is unknown.
const char* apply_changed(calendar_adapter_row* row) {
    int32_t parent_id = 0;
    if (!find_parent(row->ori_cloud_key, &parent_id)) {
        return nullptr;
    }
    if (parent_id < 1) {
        return "ori_svc_id <= 0";
    }
    if (row->value == nullptr) {
        return "value is null";
    }
    OwnedRow working;
    if (const char* message = parse_pending(row->value, &working)) {
        return message;
    }
    int32_t event_id = 0;
    if (!insert_event(working.record, row->calendar_id, &event_id)) {
        return "db_insert fail";
    }
    working.release();
    record_version(event_id,
                   last_change_version());  // Deliberate: not the parent's, unlike insert.
    row->calsvc_id = event_id;
    row->calsvc_ori_id = working.calsvc_ori_id;
    row->invalid = 0;
    static_cast<void>(  // the row stays pending: the occurrence is applied again
        _qor_calendar_db_update_adapter(row->adapter_id, row));
    return nullptr;
}

}  // namespace

int _qor_calendar_event_svc_insert(calendar_adapter_row* row) {
    if (row->invalid == 1) {
        static_cast<void>(_qor_calendar_db_insert_adapter(row));  // shows in the row's adapter_id
        return 0;
    }
    if (row->exception_status == kCancelled) {
        char* recurrence_id = nullptr;
        Record parent;
        if (!fetch_parent(row->record, row->calsvc_ori_id, &recurrence_id, &parent)) {
            QOR_LOG(CRITICAL, "calendar_db_get_record fail. id=[%d]", row->calsvc_ori_id);
            return keep_failed_row(row);
        }
        char* old_list = nullptr;
        // Deliberate: a comma and a blank here, a comma alone in the retry, and no duplicate test.
        if (read_exdate(parent.get(), &old_list) &&
            !append_exdate(parent.get(), old_list, ", ", recurrence_id)) {
            QOR_LOG(CRITICAL, "fail");
        }
        if (!update_and_keep(std::move(parent))) {
            return keep_failed_row(row);
        }
        record_version(row->calsvc_ori_id, last_change_version());
        static_cast<void>(_qor_calendar_db_insert_adapter(row));  // shows in the row's adapter_id
    } else {
        int32_t event_id = 0;
        if (!insert_event(row->record, row->calendar_id, &event_id)) {
            return keep_failed_row(row);
        }
        const int32_t version = last_change_version();
        record_version(event_id, version);
        if (row->exception_status == kChanged) {
            record_version(row->calsvc_ori_id, version);  // the same write changed the parent
        }
        store_applied_row(row, event_id);
    }
    if (row->adapter_id < 1) {
        QOR_LOG(CRITICAL, "adapter db fail");
        return kError;
    }
    arm_retry_timer();
    return 0;
}

int _qor_calendar_event_svc_update(calendar_adapter_row* row) {
    if (row->record == nullptr) {
        return 0;
    }
    int32_t event_id = 0;
    if (_qor_calendar_db_get_svc_id(row->adapter_id, &event_id) != 0) {
        QOR_LOG(CRITICAL, "db_get_adapter fail");
        return kError;
    }
    if (event_id < 1) {
        return kNoCalendarEvent;
    }
    if (calendar_db_replace_record(row->record, event_id) != 0) {
        QOR_LOG(CRITICAL, "replace fail");
        return kError;
    }
    record_version(event_id, last_change_version());
    return 0;
}

int _qor_calendar_event_svc_delete(int32_t adapter_id) {
    int32_t event_id = 0;
    if (_qor_calendar_db_get_svc_id(adapter_id, &event_id) != 0) {
        QOR_LOG(CRITICAL, "db_get_adapter fail");
        return kError;
    }
    if (event_id < 1) {
        static_cast<void>(
            _qor_calendar_db_delete_adapter(adapter_id));  // the item is gone either way
        QOR_LOG(CRITICAL, "svc_id is nothing");
        return 0;  // Deliberate: the parent's list of cancelled occurrences is not changed.
    }
    if (calendar_db_delete_record(_calendar_event._uri, event_id) != 0) {
        QOR_LOG(CRITICAL, "replace fail");  // Deliberate: the update's wording.
        return kError;
    }
    record_version(event_id, last_change_version());
    static_cast<void>(
        _qor_calendar_db_delete_adapter(adapter_id));  // a row that stays names nothing
    return 0;
}

gboolean __qor_calendar_event_svc_insert_change(gpointer /*user_data*/) {
    retry_timer = 0;
    _qor_calendar_lock();
    GList* rows = nullptr;
    static_cast<void>(_qor_calendar_db_get_exception(&rows));  // without a list there is no work
    // Deliberate: the rows are released, the cells of their list are not.
    for (const GList* entry = rows; entry != nullptr; entry = entry->next) {
        auto* const row = static_cast<calendar_adapter_row*>(entry->data);
        if (row == nullptr) {
            continue;
        }
        if (row->exception_status == kChanged) {
            if (const char* message = apply_changed(row)) {
                QOR_LOG(CRITICAL, "%s", message);
            }
        } else if (row->exception_status == kCancelled) {
            __qor_calendar_event_svc_insert_exdate(row);
        }
        _qor_calendar_free_adapter_row(row);
        free(row);
    }
    _qor_calendar_unlock();
    return G_SOURCE_REMOVE;
}

void __qor_calendar_event_svc_insert_exdate(calendar_adapter_row* row) {
    if (row->value == nullptr) {
        QOR_LOG(CRITICAL, "value is null");
        return;
    }
    OwnedRow working;
    if (const char* message = parse_pending(row->value, &working)) {
        QOR_LOG(CRITICAL, "%s", message);
        return;
    }
    const int32_t parent_id = working.calsvc_ori_id;
    char* recurrence_id = nullptr;
    Record parent;
    if (!fetch_parent(working.record, parent_id, &recurrence_id, &parent)) {
        QOR_LOG(CRITICAL, "calendar_db_get_record fail. id=[%d]", parent_id);
        return;
    }
    char* old_list = nullptr;
    if (read_exdate(parent.get(), &old_list)) {
        // Deliberate: an occurrence that is already listed clears the whole list.
        const bool listed = old_list != nullptr && strstr(old_list, recurrence_id) != nullptr;
        const bool stored =
            listed ? calendar_record_set_str(parent.get(), _calendar_event.exdate, "") == 0
                   : append_exdate(parent.get(), old_list, ",", recurrence_id);
        if (!stored) {
            QOR_LOG(CRITICAL, "fail");
        }
    }
    if (!update_and_keep(std::move(parent))) {
        return;
    }
    row->invalid = 0;
    row->calsvc_ori_id = parent_id;
    record_version(parent_id, last_change_version());
    static_cast<void>(  // the row stays pending: the occurrence is entered again
        _qor_calendar_db_update_adapter(row->adapter_id, row));
}
