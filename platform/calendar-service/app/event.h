// SPDX-License-Identifier: Apache-2.0
//
// An event as a plain value: what a calendar-service record holds, and both ways between the two.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/include/calendar_service.h"

namespace calendar_text {

struct RecordDeleter {
    void operator()(calendar_record_h record) const noexcept {
        static_cast<void>(calendar_record_destroy(record, true));  // frees the children too
    }
};
using RecordOwner = std::unique_ptr<calendar_record, RecordDeleter>;

struct ListDeleter {
    void operator()(calendar_list_h list) const noexcept {
        static_cast<void>(calendar_list_destroy(list, true));  // frees the records too
    }
};
using ListOwner = std::unique_ptr<calendar_list, ListDeleter>;

// A UTC instant, or a date of an all-day event as its midnight counted as though UTC.
struct Moment {
    bool is_date = false;
    std::int64_t at_s = 0;

    bool operator==(const Moment&) const = default;
};

struct Alarm {
    int tick = 0;       // count of units before the start
    int tick_unit = 0;  // calendar_alarm_time_unit_e: the length of a unit in seconds

    bool operator==(const Alarm&) const = default;
};

using Text = std::optional<std::string>;  // an unset text differs from an empty one

struct Event {
    int id = 0;
    int book_id = 0;
    int parent_id = 0;  // the recurring event that this one is an exception of, else 0
    int sensitivity = 0;

    Text title;
    Text description;
    Text location;
    Text organizer_name;
    Text organizer_email;
    double latitude = CALENDAR_RECORD_NO_COORDINATE;
    double longitude = CALENDAR_RECORD_NO_COORDINATE;

    Moment start;
    Moment end;  // exclusive; an all-day end at or before the start means one day
    Text start_zone;
    Text end_zone;

    int freq = CALENDAR_RECURRENCE_NONE;
    int range_type = CALENDAR_RANGE_NONE;
    Moment until;
    int count = 0;
    int interval = 1;
    int week_start = 0;  // calendar_days_of_week_e; anything else is none
    Text bysecond;
    Text byminute;
    Text byhour;
    Text byday;
    Text bymonthday;
    Text byyearday;
    Text byweekno;
    Text bymonth;
    Text bysetpos;
    Text exdate;         // cancelled occurrences, separated by commas
    Text recurrence_id;  // the occurrence that an exception stands for

    std::vector<Alarm> alarms;

    bool operator==(const Event&) const = default;

    bool is_all_day() const { return start.is_date; }
    bool repeats() const {
        return freq >= CALENDAR_RECURRENCE_DAILY && freq <= CALENDAR_RECURRENCE_YEARLY;
    }
    bool has_place() const {
        return latitude != CALENDAR_RECORD_NO_COORDINATE &&
               longitude != CALENDAR_RECORD_NO_COORDINATE;
    }
};

// The text, or an empty one when it is unset.
inline const std::string& text_or_empty(const Text& text) {
    static const std::string empty;
    return text ? *text : empty;
}

// Both return a calendar_error_e; the output is written on success only.
int read_event(calendar_record_h record, Event* out_event);
int make_record(const Event& event, RecordOwner* out_record);

// Every event of a book, or of all books when book_id is 0, in the order of their ids. The calendar
// service must be connected.
int read_events(int book_id, std::vector<Event>* out_events);

}  // namespace calendar_text
