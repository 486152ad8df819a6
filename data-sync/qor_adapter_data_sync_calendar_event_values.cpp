// SPDX-License-Identifier: Apache-2.0
//
// Entry points: reading and writing single items. A write holds the adapter mutex from just before
// the event store operation until it returns, not while the document is parsed; reading takes no
// lock.
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "common/log.h"
#include "common/owned.h"
#include "common/result.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_event_svc.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"
#include "data-sync/qor_adapter_data_sync_calendar_event_state.h"

namespace {

constexpr size_t kItemIdSize = 124;

// An item number of the host. One beyond 32 bits names nothing, as 0 does.
int32_t read_item_id(const char* text) {
    const long id = strtol(text, nullptr, 10);
    return id >= INT_MIN && id <= INT_MAX ? static_cast<int32_t>(id) : 0;
}

bool create_record(calendar_adapter_row* row) {
    return calendar_record_create(_calendar_event._uri, &row->record) == 0;
}

// A pending row keeps its document. False when memory has run out.
bool keep_document(const char* document, calendar_adapter_row* row) {
    if (row->invalid != 1) {
        return true;
    }
    row->value = strdup(document);
    return row->value != nullptr;
}

int read_document(const char* document, calendar_adapter_row* row) {
    return _qor_calendar_parse_event_from_json(document, 0, strlen(document), 0, row);
}

}  // namespace

int qor_adapter_data_sync_get_value(const char* item_id, const char* log_text,
                                    char** document) noexcept {
    if (item_id == nullptr || document == nullptr) {
        QOR_LOG(CRITICAL, "value is null");
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    OwnedRow row;
    if (_qor_calendar_db_get_adapter(read_item_id(item_id), &row) < 0) {
        QOR_LOG(CRITICAL, "db_get_adapter fail");
        return kFailure;
    }
    const bool has_event = row.calsvc_id >= 1;
    if (!has_event && row.calsvc_ori_id < 1) {
        // Deliberate: the result of the log call, which is neither success nor a status code.
        return QOR_LOG(CRITICAL, "fail(%d,%d,%s,%s)", row.calsvc_id, row.calsvc_ori_id, item_id,
                       log_text != nullptr ? log_text : "(null)");
    }
    Record event = read_event(has_event ? row.calsvc_id : row.calsvc_ori_id);
    if (!event) {
        QOR_LOG(CRITICAL, "get_record_fail");
        return kFailure;
    }
    size_t length = 0;
    const int result = _qor_calendar_parse_make_event_to_json(
        event.get(), has_event ? nullptr : row.exdate, document, &length);
    event.reset();
    __qor_calendar_event_release_memory();
    return result;
}

int qor_adapter_data_sync_insert_value(const char* /*unused*/, const char* document,
                                       char** item_id) noexcept {
    if (document == nullptr) {
        QOR_LOG(CRITICAL, "value is null");
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    OwnedRow row;
    if (!create_record(&row)) {
        QOR_LOG(CRITICAL, "record_create fail");
        return kFailure;
    }
    if (read_document(document, &row) != 0) {
        QOR_LOG(CRITICAL, "parse_event_from_json fail");
        return kFailure;
    }
    if (!keep_document(document, &row)) {
        QOR_LOG(CRITICAL, "calloc fail");
        return kFailure;
    }
    row.calendar_id = calendar_adapter->calendar_id;
    const AdapterLock lock;
    // Deliberate: the insert's result is not looked at; the host gets a number, "0" if there is
    // none.
    static_cast<void>(_qor_calendar_event_svc_insert(&row));
    char id[kItemIdSize] = {};
    static_cast<void>(snprintf(id, sizeof(id), "%d", row.adapter_id));
    if (item_id != nullptr) {
        *item_id = strdup(id);
    }
    row.release();
    __qor_calendar_event_release_memory();
    return kSuccess;
}

int qor_adapter_data_sync_update_value(const char* /*unused*/, const char* item_id,
                                       const char* document) noexcept {
    if (item_id == nullptr || document == nullptr) {
        QOR_LOG(CRITICAL, "value is null");
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    OwnedRow row;
    if (!create_record(&row)) {
        QOR_LOG(CRITICAL, "record_create fail");
        return kFailure;
    }
    // Deliberate: a document that fails part-way is applied with what was read before, unlike
    // insert.
    static_cast<void>(read_document(document, &row));
    static_cast<void>(keep_document(document, &row));  // the update writes no row: it is not missed
    if (row.adapter_id == 0) {
        row.adapter_id = read_item_id(item_id);
    }
    const AdapterLock lock;
    if (_qor_calendar_event_svc_update(&row) != 0) {
        QOR_LOG(CRITICAL, "db_update fail");
        row.release();
        return kFailure;
    }
    row.release();
    __qor_calendar_event_release_memory();
    return kSuccess;
}

int qor_adapter_data_sync_delete_value(const char* item_id) noexcept {
    if (item_id == nullptr) {
        QOR_LOG(CRITICAL, "value is null");
        return kFailure;
    }
    if (calendar_adapter == nullptr) {
        QOR_LOG(WARNING, "not initialize");
        return kFailure;
    }
    const AdapterLock lock;
    if (_qor_calendar_event_svc_delete(read_item_id(item_id)) < 0) {
        QOR_LOG(CRITICAL, "delete fail");
        return kFailure;
    }
    __qor_calendar_event_release_memory();
    return kSuccess;
}
