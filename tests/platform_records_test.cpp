// SPDX-License-Identifier: Apache-2.0
//
// Records, lists, queries and filters of the calendar service, without a store.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "common/device.h"
#include "common/owned.h"

namespace {

constexpr int kBad = CALENDAR_ERROR_INVALID_PARAMETER;

Record make(const char* uri) {
    calendar_record_h record = nullptr;
    EXPECT_EQ(calendar_record_create(uri, &record), 0);
    return Record(record);
}

void add_alarm(const Record& event, int tick) {
    Record alarm = make(_calendar_alarm._uri);
    EXPECT_EQ(calendar_record_set_int(alarm.get(), _calendar_alarm.tick, tick), 0);
    EXPECT_EQ(
        calendar_record_add_child_record(event.get(), _calendar_event.calendar_alarm, alarm.get()),
        0);
    static_cast<void>(alarm.release());  // the event's
}

TEST(PlatformRecords, StartWithTheirDefaults) {
    for (const char* uri : {_calendar_event._uri, _calendar_todo._uri}) {
        SCOPED_TRACE(uri);
        const bool event = uri == _calendar_event._uri;
        const Record record = make(uri);
        calendar_record_h r = record.get();
        int i = -1;
        double d = -1;
        calendar_time_s t{CALENDAR_TIME_LOCALTIME, {.utime = 7}};
        char mark = 0;
        char* text = &mark;
        EXPECT_EQ(calendar_record_get_int(
                      r, event ? _calendar_event.range_type : _calendar_todo.range_type, &i),
                  0);
        EXPECT_EQ(i, CALENDAR_RANGE_NONE);
        EXPECT_EQ(calendar_record_get_int(
                      r, event ? _calendar_event.interval : _calendar_todo.interval, &i),
                  0);
        EXPECT_EQ(i, 1);
        EXPECT_EQ(
            calendar_record_get_int(r, event ? _calendar_event.freq : _calendar_todo.freq, &i), 0);
        EXPECT_EQ(i, 0);
        EXPECT_EQ(calendar_record_get_double(
                      r, event ? _calendar_event.latitude : _calendar_todo.latitude, &d),
                  0);
        EXPECT_EQ(d, 1000.0);
        EXPECT_EQ(calendar_record_get_double(
                      r, event ? _calendar_event.longitude : _calendar_todo.longitude, &d),
                  0);
        EXPECT_EQ(d, 1000.0);
        EXPECT_EQ(calendar_record_get_caltime(
                      r, event ? _calendar_event.until_time : _calendar_todo.until_time, &t),
                  0);
        EXPECT_EQ(t.type, CALENDAR_TIME_UTIME);
        EXPECT_EQ(t.time.utime, 0);
        EXPECT_EQ(calendar_record_get_str_p(
                      r, event ? _calendar_event.summary : _calendar_todo.summary, &text),
                  0);
        EXPECT_EQ(text, nullptr);
    }
}

TEST(PlatformRecords, KeepTextsAsTheyAre) {
    const Record event = make(_calendar_event._uri);
    const std::string long_text(3 << 20, 'x');
    for (const char* value : {"", "plain", "not UTF-8: \xff\xc3\x28", long_text.c_str()}) {
        char* text = nullptr;
        std::string given(value);
        EXPECT_EQ(calendar_record_set_str(event.get(), _calendar_event.summary, given.c_str()), 0);
        given.assign(given.size(), '#');  // the record has a copy
        EXPECT_EQ(calendar_record_get_str_p(event.get(), _calendar_event.summary, &text), 0);
        EXPECT_STREQ(text, value);
        EXPECT_EQ(calendar_record_set_str(event.get(), _calendar_event.summary, nullptr), 0);
        EXPECT_EQ(calendar_record_get_str_p(event.get(), _calendar_event.summary, &text), 0);
        EXPECT_EQ(text, nullptr);
    }
}

TEST(PlatformRecords, RefuseWhatTheirViewDoesNotHave) {
    const Record owner = make(_calendar_event._uri);
    calendar_record_h event = owner.get();
    int i = 5;
    double d = 5;
    char* text = nullptr;
    calendar_time_s time{};
    const char* uri = nullptr;
    calendar_record_h record = nullptr;
    const int no_such_type = 2;
    std::memcpy(&time.type, &no_such_type, sizeof time.type);
    const struct {
        const char* name;
        int result;
    } cases[] = {
        {"unknown view", calendar_record_create("no.such.view", &record)},
        {"no view", calendar_record_create(nullptr, &record)},
        {"nowhere to put the record", calendar_record_create(_calendar_event._uri, nullptr)},
        {"no record", calendar_record_get_int(nullptr, _calendar_event.id, &i)},
        {"nowhere to put the value", calendar_record_get_int(event, _calendar_event.id, nullptr)},
        {"int of a text", calendar_record_get_int(event, _calendar_event.summary, &i)},
        {"text of an int", calendar_record_get_str_p(event, _calendar_event.id, &text)},
        {"double of an int", calendar_record_get_double(event, _calendar_event.freq, &d)},
        {"time of a text", calendar_record_get_caltime(event, _calendar_event.exdate, &time)},
        {"set int of a time", calendar_record_set_int(event, _calendar_event.start_time, 1)},
        {"set text of an int", calendar_record_set_str(event, _calendar_event.freq, "1")},
        {"set double of a text", calendar_record_set_double(event, _calendar_event.summary, 1)},
        {"no such kind of time",
         calendar_record_set_caltime(event, _calendar_event.end_time, time)},
        {"another view's property", calendar_record_set_int(event, _calendar_book.account_id, 1)},
        {"a property past the last", calendar_record_get_int(event, _calendar_event.id + 77, &i)},
        {"property 0", calendar_record_get_int(event, 0, &i)},
        {"the URI of nothing", calendar_record_get_uri_p(nullptr, &uri)},
        {"children of a text",
         calendar_record_get_child_record_count(event, _calendar_event.summary, &i)},
        {"no child",
         calendar_record_add_child_record(event, _calendar_event.calendar_alarm, nullptr)},
        {"a child of another view",
         calendar_record_add_child_record(event, _calendar_event.calendar_alarm, event)},
        {"destroying nothing", calendar_record_destroy(nullptr, true)},
        {"destroying no list", calendar_list_destroy(nullptr, true)},
        {"the first of no list", calendar_list_first(nullptr)},
        {"the next of no list", calendar_list_next(nullptr)},
        {"a record of no list", calendar_list_get_current_record_p(nullptr, &record)},
        {"the count of no list", calendar_list_get_count(nullptr, &i)},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(c.result, kBad) << c.name;
    }
    EXPECT_EQ(i, 5);
    EXPECT_EQ(record, nullptr);
    const Record exception = make(_calendar_event._uri);
    EXPECT_EQ(calendar_record_add_child_record(event, _calendar_event.exception, exception.get()),
              CALENDAR_ERROR_NOT_SUPPORTED);
}

TEST(PlatformRecords, HoldTheirChildrenUntilDestroyedWithoutThem) {
    Record event = make(_calendar_event._uri);
    int count = -1;
    int has_alarm = -1;
    EXPECT_EQ(
        calendar_record_get_child_record_count(event.get(), _calendar_event.calendar_alarm, &count),
        0);
    EXPECT_EQ(count, 0);
    add_alarm(event, 10);
    add_alarm(event, 20);
    EXPECT_EQ(calendar_record_get_int(event.get(), _calendar_event.has_alarm, &has_alarm), 0);
    EXPECT_EQ(has_alarm, 1);
    calendar_record_h first = nullptr;
    calendar_record_h second = nullptr;
    const unsigned int alarms = _calendar_event.calendar_alarm;
    EXPECT_EQ(calendar_record_get_child_record_at_p(event.get(), alarms, 0, &first), 0);
    EXPECT_EQ(calendar_record_get_child_record_at_p(event.get(), alarms, 1, &second), 0);
    for (const int index : {-1, 2}) {
        calendar_record_h none = nullptr;
        EXPECT_EQ(calendar_record_get_child_record_at_p(event.get(), alarms, index, &none),
                  CALENDAR_ERROR_NO_DATA);
    }
    int tick = 0;
    EXPECT_EQ(calendar_record_get_int(second, _calendar_alarm.tick, &tick), 0);
    EXPECT_EQ(tick, 20);

    const Record other = make(_calendar_event._uri);
    EXPECT_EQ(calendar_record_add_child_record(other.get(), alarms, first), kBad) << "has a parent";
    EXPECT_EQ(calendar_record_destroy(first, true), kBad) << "its parent will destroy it";

    EXPECT_EQ(calendar_record_destroy(event.release(), false), 0);
    EXPECT_EQ(calendar_record_add_child_record(other.get(), alarms, first), 0) << "free again";
    EXPECT_EQ(calendar_record_destroy(second, true), 0);
}

TEST(PlatformRecords, FiltersAreConditionsWithAnOperatorBetween) {
    calendar_filter_h made = nullptr;
    ASSERT_EQ(calendar_filter_create(_calendar_book._uri, &made), 0);
    const Filter owner(made);
    calendar_query_h query = nullptr;
    ASSERT_EQ(calendar_query_create(_calendar_book._uri, &query), 0);
    const Query query_owner(query);
    const auto add = [&](unsigned int property) {
        return calendar_filter_add_int(made, property, CALENDAR_MATCH_EQUAL, 1);
    };
    EXPECT_EQ(calendar_filter_add_operator(made, CALENDAR_FILTER_OPERATOR_AND), kBad) << "first";
    EXPECT_EQ(add(_calendar_book.name), kBad) << "a text";
    EXPECT_EQ(add(_calendar_event.id), kBad) << "of another view";
    EXPECT_EQ(add(_calendar_book.account_id), 0);
    EXPECT_EQ(add(_calendar_book.store_type), kBad) << "without an operator";
    EXPECT_EQ(calendar_query_set_filter(query, made), 0);
    EXPECT_EQ(calendar_filter_add_operator(made, CALENDAR_FILTER_OPERATOR_OR),
              CALENDAR_ERROR_NOT_SUPPORTED);
    EXPECT_EQ(calendar_filter_add_operator(made, CALENDAR_FILTER_OPERATOR_AND), 0);
    EXPECT_EQ(calendar_filter_add_operator(made, CALENDAR_FILTER_OPERATOR_AND), kBad) << "twice";
    EXPECT_EQ(calendar_query_set_filter(query, made), kBad) << "ends with an operator";
    EXPECT_EQ(add(_calendar_book.store_type), 0);
    EXPECT_EQ(calendar_query_set_filter(query, made), 0);

    calendar_query_h events = nullptr;
    ASSERT_EQ(calendar_query_create(_calendar_event._uri, &events), 0);
    EXPECT_EQ(calendar_query_set_filter(events, made), kBad) << "another view";
    EXPECT_EQ(calendar_query_destroy(events), 0);
    EXPECT_EQ(calendar_query_create(_calendar_todo._uri, &events), CALENDAR_ERROR_NOT_SUPPORTED);
    EXPECT_EQ(calendar_filter_create("no.such.view", &made), kBad);
    EXPECT_EQ(calendar_query_destroy(nullptr), kBad);
    EXPECT_EQ(calendar_filter_destroy(nullptr), kBad);
}

}  // namespace
