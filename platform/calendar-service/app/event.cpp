// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/app/event.h"

#include <algorithm>

#include "platform/calendar-service/app/time_text.h"

namespace calendar_text {
namespace {

using Property = unsigned int calendar_event_view::*;

struct IntField {
    Property property;
    int Event::*member;
};
constexpr IntField kInts[] = {
    {&calendar_event_view::calendar_book_id, &Event::book_id},
    {&calendar_event_view::original_event_id, &Event::parent_id},
    {&calendar_event_view::sensitivity, &Event::sensitivity},
    {&calendar_event_view::freq, &Event::freq},
    {&calendar_event_view::range_type, &Event::range_type},
    {&calendar_event_view::count, &Event::count},
    {&calendar_event_view::interval, &Event::interval},
    {&calendar_event_view::wkst, &Event::week_start},
};

struct TextField {
    Property property;
    Text Event::*member;
};
constexpr TextField kTexts[] = {
    {&calendar_event_view::summary, &Event::title},
    {&calendar_event_view::description, &Event::description},
    {&calendar_event_view::location, &Event::location},
    {&calendar_event_view::organizer_name, &Event::organizer_name},
    {&calendar_event_view::organizer_email, &Event::organizer_email},
    {&calendar_event_view::start_tzid, &Event::start_zone},
    {&calendar_event_view::end_tzid, &Event::end_zone},
    {&calendar_event_view::bysecond, &Event::bysecond},
    {&calendar_event_view::byminute, &Event::byminute},
    {&calendar_event_view::byhour, &Event::byhour},
    {&calendar_event_view::byday, &Event::byday},
    {&calendar_event_view::bymonthday, &Event::bymonthday},
    {&calendar_event_view::byyearday, &Event::byyearday},
    {&calendar_event_view::byweekno, &Event::byweekno},
    {&calendar_event_view::bymonth, &Event::bymonth},
    {&calendar_event_view::bysetpos, &Event::bysetpos},
    {&calendar_event_view::exdate, &Event::exdate},
    {&calendar_event_view::recurrence_id, &Event::recurrence_id},
};

struct DoubleField {
    Property property;
    double Event::*member;
};
constexpr DoubleField kDoubles[] = {
    {&calendar_event_view::latitude, &Event::latitude},
    {&calendar_event_view::longitude, &Event::longitude},
};

struct TimeField {
    Property property;
    Moment Event::*member;
};
constexpr TimeField kTimes[] = {
    {&calendar_event_view::start_time, &Event::start},
    {&calendar_event_view::end_time, &Event::end},
    {&calendar_event_view::until_time, &Event::until},
};

Moment moment_of(const calendar_time_s& time) {
    if (time.type == CALENDAR_TIME_UTIME) {
        return {false, std::clamp(time.time.utime, kEarliest_s, kLatest_s)};
    }
    return {true, day_of(time.time.date.year, time.time.date.month, time.time.date.mday)};
}

calendar_time_s caltime_of(const Moment& moment) {
    calendar_time_s time = {};
    if (!moment.is_date) {
        time.type = CALENDAR_TIME_UTIME;
        time.time.utime = moment.at_s;
        return time;
    }
    const Civil civil = civil_of(moment.at_s);
    time.type = CALENDAR_TIME_LOCALTIME;
    time.time.date.year = civil.year;
    time.time.date.month = civil.month;
    time.time.date.mday = civil.day;
    return time;
}

int read_alarms(calendar_record_h record, std::vector<Alarm>* out_alarms) {
    int count = 0;
    int rc = calendar_record_get_child_record_count(record, _calendar_event.calendar_alarm, &count);
    for (int i = 0; rc == CALENDAR_ERROR_NONE && i < count; ++i) {
        calendar_record_h child = nullptr;
        Alarm alarm;
        rc = calendar_record_get_child_record_at_p(record, _calendar_event.calendar_alarm, i,
                                                   &child);
        rc = rc != 0 ? rc : calendar_record_get_int(child, _calendar_alarm.tick, &alarm.tick);
        rc = rc != 0 ? rc
                     : calendar_record_get_int(child, _calendar_alarm.tick_unit, &alarm.tick_unit);
        if (rc == CALENDAR_ERROR_NONE) {
            out_alarms->push_back(alarm);
        }
    }
    return rc;
}

int add_alarm(calendar_record_h record, const Alarm& alarm) {
    calendar_record_h made = nullptr;
    int rc = calendar_record_create(_calendar_alarm._uri, &made);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    RecordOwner child(made);
    rc = calendar_record_set_int(made, _calendar_alarm.tick, alarm.tick);
    rc = rc != 0 ? rc : calendar_record_set_int(made, _calendar_alarm.tick_unit, alarm.tick_unit);
    rc = rc != 0 ? rc
                 : calendar_record_add_child_record(record, _calendar_event.calendar_alarm, made);
    if (rc == CALENDAR_ERROR_NONE) {
        static_cast<void>(child.release());  // the event record owns it now
    }
    return rc;
}

struct QueryDeleter {
    void operator()(calendar_query_h query) const noexcept {
        static_cast<void>(calendar_query_destroy(query));
    }
};
struct FilterDeleter {
    void operator()(calendar_filter_h filter) const noexcept {
        static_cast<void>(calendar_filter_destroy(filter));
    }
};

int restrict_to_book(calendar_query_h query, int book_id) {
    calendar_filter_h made = nullptr;
    int rc = calendar_filter_create(_calendar_event._uri, &made);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    const std::unique_ptr<calendar_filter, FilterDeleter> filter(made);
    rc = calendar_filter_add_int(made, _calendar_event.calendar_book_id, CALENDAR_MATCH_EQUAL,
                                 book_id);
    return rc != 0 ? rc : calendar_query_set_filter(query, made);
}

}  // namespace

int read_event(calendar_record_h record, Event* out_event) {
    Event event;
    int rc = calendar_record_get_int(record, _calendar_event.id, &event.id);
    for (const IntField& field : kInts) {
        rc = rc != 0 ? rc
                     : calendar_record_get_int(record, _calendar_event.*field.property,
                                               &(event.*field.member));
    }
    for (const DoubleField& field : kDoubles) {
        rc = rc != 0 ? rc
                     : calendar_record_get_double(record, _calendar_event.*field.property,
                                                  &(event.*field.member));
    }
    for (const TextField& field : kTexts) {
        char* text = nullptr;
        rc = rc != 0 ? rc
                     : calendar_record_get_str_p(record, _calendar_event.*field.property, &text);
        if (text != nullptr) {
            event.*field.member = text;
        }
    }
    for (const TimeField& field : kTimes) {
        calendar_time_s time = {};
        rc = rc != 0 ? rc
                     : calendar_record_get_caltime(record, _calendar_event.*field.property, &time);
        event.*field.member = moment_of(time);
    }
    rc = rc != 0 ? rc : read_alarms(record, &event.alarms);
    if (rc == CALENDAR_ERROR_NONE) {
        *out_event = std::move(event);
    }
    return rc;
}

int make_record(const Event& event, RecordOwner* out_record) {
    calendar_record_h made = nullptr;
    int rc = calendar_record_create(_calendar_event._uri, &made);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    RecordOwner record(made);
    for (const IntField& field : kInts) {
        rc = rc != 0 ? rc
                     : calendar_record_set_int(made, _calendar_event.*field.property,
                                               event.*field.member);
    }
    for (const DoubleField& field : kDoubles) {
        rc = rc != 0 ? rc
                     : calendar_record_set_double(made, _calendar_event.*field.property,
                                                  event.*field.member);
    }
    for (const TextField& field : kTexts) {
        const Text& text = event.*field.member;
        rc = rc != 0 ? rc
                     : calendar_record_set_str(made, _calendar_event.*field.property,
                                               text ? text->c_str() : nullptr);
    }
    for (const TimeField& field : kTimes) {
        rc = rc != 0 ? rc
                     : calendar_record_set_caltime(made, _calendar_event.*field.property,
                                                   caltime_of(event.*field.member));
    }
    for (const Alarm& alarm : event.alarms) {
        rc = rc != 0 ? rc : add_alarm(made, alarm);
    }
    if (rc == CALENDAR_ERROR_NONE) {
        *out_record = std::move(record);
    }
    return rc;
}

int read_events(int book_id, std::vector<Event>* out_events) {
    calendar_query_h made_query = nullptr;
    int rc = calendar_query_create(_calendar_event._uri, &made_query);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    const std::unique_ptr<calendar_query, QueryDeleter> query(made_query);
    if (book_id != 0) {
        rc = restrict_to_book(made_query, book_id);
    }
    calendar_list_h made_list = nullptr;
    rc = rc != 0 ? rc : calendar_db_get_records_with_query(made_query, 0, 0, &made_list);
    if (rc != CALENDAR_ERROR_NONE) {
        return rc;
    }
    const ListOwner list(made_list);
    std::vector<Event> events;
    for (int at = calendar_list_first(made_list); at == CALENDAR_ERROR_NONE;
         at = calendar_list_next(made_list)) {
        calendar_record_h record = nullptr;
        Event event;
        rc = calendar_list_get_current_record_p(made_list, &record);
        rc = rc != 0 ? rc : read_event(record, &event);
        if (rc != CALENDAR_ERROR_NONE) {
            return rc;
        }
        events.push_back(std::move(event));
    }
    *out_events = std::move(events);
    return CALENDAR_ERROR_NONE;
}

}  // namespace calendar_text
