// SPDX-License-Identifier: Apache-2.0
//
// The list functions.
#include "platform/calendar-service/list.h"

calendar_list::~calendar_list() {
    for (const calendar_record_h record : records) {
        device::DestroyTree()(record);
    }
}

void calendar_list::append(device::RecordOwner record) {
    records.push_back(record.get());
    record.release()->held = true;
}

int calendar_list_get_count(calendar_list_h list, int* out_count) {
    if (list == nullptr || out_count == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    *out_count = static_cast<int>(list->records.size());
    return CALENDAR_ERROR_NONE;
}

int calendar_list_first(calendar_list_h list) {
    if (list == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    list->current = 0;
    return list->records.empty() ? CALENDAR_ERROR_NO_DATA : CALENDAR_ERROR_NONE;
}

int calendar_list_next(calendar_list_h list) {
    if (list == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (list->current < list->records.size()) {
        ++list->current;
    }
    return list->current < list->records.size() ? CALENDAR_ERROR_NONE : CALENDAR_ERROR_NO_DATA;
}

int calendar_list_get_current_record_p(calendar_list_h list, calendar_record_h* out_record) {
    if (list == nullptr || out_record == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (list->current >= list->records.size()) {
        return CALENDAR_ERROR_NO_DATA;
    }
    *out_record = list->records[list->current];
    return CALENDAR_ERROR_NONE;
}

int calendar_list_destroy(calendar_list_h list, bool destroy_records) {
    if (list == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (!destroy_records) {
        for (const calendar_record_h record : list->records) {
            record->held = false;
        }
        list->records.clear();
    }
    delete list;
    return CALENDAR_ERROR_NONE;
}
