// SPDX-License-Identifier: Apache-2.0
//
// Event records and rows as text, so that a test compares all of what an operation stored.
#pragma once

#include <sstream>
#include <string>

#include "common/owned.h"
#include "data-sync/calendar/qor_adapter_data_sync_calendar_db.h"

inline std::string property_text(calendar_record_h record, unsigned int property) {
    std::ostringstream out;
    out.precision(12);
    char* text = nullptr;
    int number = 0;
    double degrees = 0;
    calendar_time_s time{};
    // A property has one type; the getters of the others fail.
    if (calendar_record_get_str_p(record, property, &text) == 0) {
        out << (text != nullptr ? text : "(null)");
    } else if (calendar_record_get_int(record, property, &number) == 0) {
        out << number;
    } else if (calendar_record_get_double(record, property, &degrees) == 0) {
        out << degrees;
    } else if (calendar_record_get_caltime(record, property, &time) != 0) {
        out << "unreadable";
    } else if (time.type == CALENDAR_TIME_UTIME) {
        out << time.time.utime;
    } else {
        const auto& d = time.time.date;
        out << d.year << '-' << d.month << '-' << d.mday;
        out << (d.hour != 0 || d.minute != 0 || d.second != 0 || d.is_leap_month ? " ..." : "");
    }
    return out.str();
}

// What an event record holds beyond a new one, as "name=value; ": times as seconds or as a date,
// an alarm as "tick*unit".
inline std::string event_text(calendar_record_h event) {
    const auto& view = _calendar_event;
    const struct {
        const char* name;
        unsigned int property;
    } rows[] = {
        {"summary", view.summary},
        {"location", view.location},
        {"description", view.description},
        {"start", view.start_time},
        {"end", view.end_time},
        {"start_tzid", view.start_tzid},
        {"end_tzid", view.end_tzid},
        {"sensitivity", view.sensitivity},
        {"freq", view.freq},
        {"interval", view.interval},
        {"range", view.range_type},
        {"count", view.count},
        {"until", view.until_time},
        {"byday", view.byday},
        {"wkst", view.wkst},
        {"original_event_id", view.original_event_id},
        {"recurrence_id", view.recurrence_id},
        {"organizer_name", view.organizer_name},
        {"organizer_email", view.organizer_email},
        {"longitude", view.longitude},
        {"latitude", view.latitude},
    };
    calendar_record_h handle = nullptr;
    static_cast<void>(calendar_record_create(view._uri, &handle));  // null: everything differs
    const Record unset(handle);
    std::string all;
    for (const auto& row : rows) {
        const std::string text = property_text(event, row.property);
        if (text != property_text(unset.get(), row.property)) {
            all += std::string(row.name) + '=' + text + "; ";
        }
    }
    calendar_record_h alarm = nullptr;
    for (int i = 0;
         calendar_record_get_child_record_at_p(event, view.calendar_alarm, i, &alarm) == 0; ++i) {
        all += "alarm=" + property_text(alarm, _calendar_alarm.tick) + '*' +
               property_text(alarm, _calendar_alarm.tick_unit) + "; ";
    }
    return all;
}

// The same of a row's record, and the row's own fields that are set.
inline std::string row_text(const calendar_adapter_row& row) {
    std::ostringstream out;
    const auto number = [&out](const char* name, int value) {
        if (value != 0) {
            out << name << '=' << value << "; ";
        }
    };
    const auto text = [&out](const char* name, const char* value) {
        if (value != nullptr) {
            out << name << '=' << value << "; ";
        }
    };
    number("parent", row.calsvc_ori_id);
    text("parent_key", row.ori_cloud_key);
    number("status", row.exception_status);
    number("invalid", row.invalid);
    text("exdate", row.exdate);
    number("is_allday", row.is_allday);
    number("has_start", row.has_start);
    number("has_pending_duration", row.has_pending_duration);
    text("pending_duration", row.pending_duration);
    return event_text(row.record) + out.str();
}
