// SPDX-License-Identifier: Apache-2.0
#include <climits>
#include <functional>
#include <string>
#include <vector>

#include "data-sync/calendar/qor_adapter_data_sync_calendar_parser_event.h"
#include "tests/support/device_test.h"
#include "tests/support/event_text.h"
#include "tests/support/heap.h"

namespace {

constexpr char kMake[] = "_qor_calendar_parse_make_event_to_json";
const calendar_event_view& kEvent = _calendar_event;

// What is set in a record, in short.
struct Draft {
    calendar_record_h record;

    void text(unsigned int property, const char* value) const {
        EXPECT_EQ(calendar_record_set_str(record, property, value), 0);
    }
    void number(unsigned int property, int value) const {
        EXPECT_EQ(calendar_record_set_int(record, property, value), 0);
    }
    void degrees(unsigned int property, double value) const {
        EXPECT_EQ(calendar_record_set_double(record, property, value), 0);
    }
    void instant(unsigned int property, int64_t seconds) const {
        calendar_time_s time{};
        time.time.utime = seconds;
        EXPECT_EQ(calendar_record_set_caltime(record, property, time), 0);
    }
    void date(unsigned int property, int year, int month, int mday, int hour = 0) const {
        calendar_time_s time{};
        time.type = CALENDAR_TIME_LOCALTIME;
        time.time.date = {year, month, mday, hour, 0, 0, false};
        EXPECT_EQ(calendar_record_set_caltime(record, property, time), 0);
    }
    void alarm(int tick, int unit) const {
        calendar_record_h alarm = nullptr;
        EXPECT_EQ(calendar_record_create(_calendar_alarm._uri, &alarm), 0);
        EXPECT_EQ(calendar_record_set_int(alarm, _calendar_alarm.tick, tick), 0);
        EXPECT_EQ(calendar_record_set_int(alarm, _calendar_alarm.tick_unit, unit), 0);
        EXPECT_EQ(calendar_record_add_child_record(record, kEvent.calendar_alarm, alarm), 0);
    }
};

void fill_meeting(const Draft& e) {
    e.text(kEvent.summary, "Meeting");
    e.text(kEvent.location, "Room \"5\"");
    e.text(kEvent.description, "Line\n\xc3\xa9");
    e.instant(kEvent.start_time, 1394875800);
    e.instant(kEvent.end_time, 1394879400);
    e.text(kEvent.start_tzid, "Asia/Seoul");
    e.text(kEvent.end_tzid, "Asia/Seoul");
    e.alarm(15, 60);
    e.alarm(60, 60);
    e.number(kEvent.freq, CALENDAR_RECURRENCE_WEEKLY);
    e.number(kEvent.range_type, CALENDAR_RANGE_COUNT);
    e.number(kEvent.count, 10);
    e.text(kEvent.byday, "MO,WE");
    e.text(kEvent.organizer_name, "A. Person");
    e.text(kEvent.organizer_email, "A. Person");
    e.degrees(kEvent.longitude, -122.419416);
    e.degrees(kEvent.latitude, 0.5);
}

constexpr char kMeeting[] =
    R"({"EVENT":{"title":"Meeting","eventLocation":"Room \"5\"","description":"Line\né",)"
    R"("eventStatus":"0","dtstart":"1394875800000","dtend":"1394879400000",)"
    R"("eventTimezone":"Asia/Seoul","accessLevel":"0","hasAlarm":"1",)"
    R"("rrule":"FREQ=WEEKLY;INTERVAL=1;BYDAY=MO,WE;COUNT=10","hasAttendeeData":"0",)"
    R"("organizer":"A. Person","longitude":"-122419416","latitude":"0500000"},)"
    R"("REMINDERS":[{"method":"1","minutes":"15"},{"method":"1","minutes":"60"}]})";

struct Made {
    GText text;
    size_t length = 0;
    int result = 0;

    explicit Made(calendar_record_h record, const char* exdate = nullptr) {
        char* made = nullptr;
        result = _qor_calendar_parse_make_event_to_json(record, exdate, &made, &length);
        text.reset(made);
    }
    std::string string() const { return text ? text.get() : "(null)"; }
};

// The device knows the event of the book; the host knows it by the cloud key "key".
class EventMakingTest : public DeviceTest {
  protected:
    EventMakingTest() {
        add_cloud_key(1, "key");
        EXPECT_EQ(_qor_calendar_db_open(), 0);
        log();
    }
    ~EventMakingTest() override { _qor_calendar_db_close(); }

    Record meeting(int id) {
        Record record = new_record(kEvent._uri);
        fill_meeting({record.get()});
        EXPECT_EQ(calendar_record_set_int(record.get(), kEvent.id, id), 0);
        return record;
    }
    void map(int svc_id) {
        calendar_adapter_row row{};
        row.calsvc_id = svc_id;
        EXPECT_EQ(_qor_calendar_db_insert_adapter(&row), 0);
    }
};

TEST_F(EventMakingTest, ARecordGivesItsDocumentWhichGivesTheRecord) {
    const std::string plain = R"("accessLevel":"0","hasAlarm":"0","hasAttendeeData":"0"}})";
    const struct {
        const char* name;
        std::function<void(const Draft&)> fill;
        std::string document;
        const char* read_back = nullptr;  // where it differs
    } cases[] = {
        {"everything", fill_meeting, kMeeting},
        {"summary and times",
         [](const Draft& e) {
             e.text(kEvent.summary, "x");
             e.instant(kEvent.start_time, 1);
             e.instant(kEvent.end_time, -1);
         },
         R"({"EVENT":{"title":"x","eventStatus":"0","dtstart":"1000","dtend":"-1000",)" + plain},
        {"all day",
         [](const Draft& e) {
             e.date(kEvent.start_time, 2013, 1, 1);
             e.date(kEvent.end_time, 2013, 1, 2);
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"1356998400000","dtend":"1357084800000",)"
         R"("allDay":"1",)" +
             plain},
        {"empty texts are written",
         [](const Draft& e) {
             e.text(kEvent.summary, "");
             e.text(kEvent.organizer_name, "");
             e.text(kEvent.organizer_email, "");
         },
         R"({"EVENT":{"title":"","eventStatus":"0","dtstart":"0","dtend":"0","accessLevel":"0",)"
         R"("hasAlarm":"0","hasAttendeeData":"0","organizer":""}})"},
        {"what the document does not carry",
         [](const Draft& e) {
             e.number(kEvent.sensitivity, 2);
             e.text(kEvent.end_tzid, "Asia/Tokyo");
             e.text(kEvent.organizer_email, "a@example.org");
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"0","dtend":"0",)" + plain, ""},
        {"a zone of the start alone, alarms in other units",
         [](const Draft& e) {
             e.text(kEvent.start_tzid, "Asia/Tokyo");
             e.alarm(2, 3600);
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"0","dtend":"0","eventTimezone":"Asia/Tokyo",)"
         R"("accessLevel":"0","hasAlarm":"1","hasAttendeeData":"0"},)"
         R"("REMINDERS":[{"method":"1","minutes":"120"}]})",
         "start_tzid=Asia/Tokyo; end_tzid=Asia/Tokyo; alarm=120*60; "},
        {"alarms that has_alarm does not tell of",
         [](const Draft& e) {
             e.alarm(1, 60);
             e.number(kEvent.has_alarm, 0);
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"0","dtend":"0",)" + plain, ""},
        {"has_alarm without alarms", [](const Draft& e) { e.number(kEvent.has_alarm, 2); },
         R"({"EVENT":{"eventStatus":"0","dtstart":"0","dtend":"0","accessLevel":"0",)"
         R"("hasAlarm":"2","hasAttendeeData":"0"},"REMINDERS":[]})"},
        {"the start decides how the end is read",
         [](const Draft& e) {
             e.date(kEvent.start_time, 2013, 1, 1, 12);              // the hour is not looked at
             e.instant(kEvent.end_time, (int64_t{1} << 32) + 2013);  // as a date, 2013-01-00
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"1356998400000","dtend":"1356912000000",)"
         R"("allDay":"1",)" +
             plain,
         "start=2013-1-1; end=2012-12-31; "},
        {"the limits",
         [](const Draft& e) {
             e.instant(kEvent.start_time, INT64_MAX);
             e.instant(kEvent.end_time, INT64_MIN);
         },
         R"({"EVENT":{"eventStatus":"0","dtstart":"9223372036854775807",)"
         R"("dtend":"-9223372036854775808",)" +
             plain,
         "start=9223372036854776; end=-9223372036854776; "},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        const Record record = new_record(kEvent._uri);
        c.fill({record.get()});
        const Made made(record.get());
        EXPECT_EQ(made.result, 0);
        EXPECT_EQ(made.string(), c.document);
        EXPECT_EQ(made.length, c.document.size());

        const Record again = new_record(kEvent._uri);
        calendar_adapter_row row{};
        row.record = again.get();
        EXPECT_EQ(_qor_calendar_parse_event_from_json(made.text.get(), 0, made.length, 0, &row), 0);
        EXPECT_EQ(event_text(again.get()),
                  c.read_back != nullptr ? c.read_back : event_text(record.get()));
        EXPECT_EQ(row.exception_status, 0);
        EXPECT_TRUE(log().empty());
    }
}

TEST_F(EventMakingTest, AnOccurrenceIsCancelledByItsParentsKey) {
    map(7);
    const Record record = meeting(7);
    const Made made(record.get(), "20140315T093000Z");
    EXPECT_EQ(made.result, 0);
    EXPECT_EQ(made.string(),
              R"({"EVENT":{"title":"Meeting","eventLocation":"Room \"5\"","description":"Line\né",)"
              R"("dtstart":"1394875800000","dtend":"1394879400000","eventTimezone":"Asia/Seoul",)"
              R"("accessLevel":"0","hasAlarm":"1","original_sync_id":"key",)"
              R"("originalInstanceTime":"1394875800000","eventStatus":"2","hasAttendeeData":"0",)"
              R"("organizer":"A. Person","longitude":"-122419416","latitude":"0500000"},)"
              R"("REMINDERS":[{"method":"1","minutes":"15"},{"method":"1","minutes":"60"}]})");
    const Record again = new_record(kEvent._uri);
    calendar_adapter_row row{};
    row.record = again.get();
    ASSERT_EQ(_qor_calendar_parse_event_from_json(made.text.get(), 0, made.length, 0, &row), 0);
    EXPECT_EQ(row.exception_status, 2);
    EXPECT_EQ(row.calsvc_ori_id, 7);
    EXPECT_STREQ(row.exdate, "20140315T093000Z");
    row.record = nullptr;
    _qor_calendar_free_adapter_row(&row);

    const Record date(meeting(7));
    EXPECT_NE(
        Made(date.get(), "20140315").string().find(R"("originalInstanceTime":"1394841600000")"),
        std::string::npos);

    for (const int unknown : {0, 8}) {  // no id, or not in the map table
        const Record other = meeting(unknown);
        const Made none(other.get(), "20140315");
        EXPECT_EQ(none.result, 6);
        EXPECT_FALSE(none.text);
        EXPECT_EQ(log(), std::vector{critical(kMake, "get error(0)")});
    }
}

TEST_F(EventMakingTest, WhatIsMissingIsRefusedSilently) {
    const Record record = meeting(1);
    char* text = nullptr;
    EXPECT_EQ(_qor_calendar_parse_make_event_to_json(nullptr, nullptr, &text, nullptr), -1);
    EXPECT_EQ(_qor_calendar_parse_make_event_to_json(record.get(), nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(text, nullptr);
    EXPECT_TRUE(log().empty());
    EXPECT_EQ(_qor_calendar_parse_make_event_to_json(record.get(), nullptr, &text, nullptr), 0);
    EXPECT_STREQ(GText(text).get(), kMeeting);
}

TEST_F(EventMakingTest, AnAlarmThatIsNoCountOfMinutesFailsTheEvent) {
    for (const int unit : {CALENDAR_ALARM_NONE, CALENDAR_ALARM_TIME_UNIT_SPECIFIC}) {
        const Record record = meeting(1);
        Draft{record.get()}.alarm(5, unit);
        const Made made(record.get());
        EXPECT_EQ(made.result, 6);
        EXPECT_FALSE(made.text);
        const std::vector<LogLine> logged = log();
        ASSERT_EQ(logged.size(), 2U);
        EXPECT_EQ(logged[0].function, "_qor_calendar_parse_make_reminder_to_json");
        EXPECT_EQ(logged[1], critical(kMake, "get error(ffffffff)"));
    }
}

// Every call fails once: the document, but for what a failure is to leave out, or a code.
TEST_F(EventMakingTest, EachFailedCallEndsTheMakingWithItsCode) {
    const std::string service = "get error(fffffffb)";
    std::string no_rule = kMeeting;
    no_rule.erase(no_rule.find("\"rrule\""),
                  sizeof R"("rrule":"FREQ=WEEKLY;INTERVAL=1;BYDAY=MO,WE;COUNT=10")");
    std::string no_longitude = kMeeting;
    no_longitude.erase(no_longitude.find("\"longitude\""), sizeof R"("longitude":"-122419416")");
    struct Outcome {
        int first;  // of the calls, up to the next row's
        std::string document_or_message;
    };
    const struct {
        const char* function;
        int calls;
        std::vector<Outcome> outcomes;
    } cases[] = {
        {"calendar_record_get_str_p", 14, {{1, service}, {5, no_rule}, {14, service}}},
        {"calendar_record_get_caltime", 2, {{1, service}}},
        // has_alarm, two alarms of tick and unit, then freq, interval, wkst, range type and count.
        {"calendar_record_get_int",
         10,
         {{1, service}, {2, "get error(ffffffff)"}, {6, no_rule}, {10, ""}}},
        {"calendar_record_get_child_record_count", 1, {{1, service}}},
        {"calendar_record_get_child_record_at_p", 2, {{1, service}}},
        {"calendar_record_get_double", 2, {{1, no_longitude}, {2, "get error(6)"}}},
        {"calendar_record_get_uri_p", 3, {{1, no_rule}, {2, no_longitude}, {3, "get error(4)"}}},
        {"json_object_new",
         4,
         {{1, "json_object_new fail"}, {2, "get error(ffffffff)"}, {4, "json_object_new fail"}}},
        {"json_array_new", 1, {{1, "json_array_new fail"}}},
        {"json_generator_new", 1, {{1, "json_generator_new fail"}}},
        {"json_node_new", 1, {{1, "json_node_new fail"}}},
    };
    const Record record = meeting(1);
    for (const auto& c : cases) {
        for (int nth = 1; nth <= c.calls + 1; ++nth) {
            SCOPED_TRACE(testing::Message() << c.function << ' ' << nth);
            faults::fail(c.function, nth);
            const Made made(record.get());
            EXPECT_EQ(faults::fired(), nth <= c.calls);
            faults::clear();
            std::string expected;
            for (const Outcome& outcome : c.outcomes) {
                expected = nth >= outcome.first ? outcome.document_or_message : expected;
            }
            const std::vector<LogLine> logged = log();
            if (nth > c.calls) {
                EXPECT_EQ(made.string(), kMeeting);
            } else if (expected.empty()) {  // a count that cannot be read is written all the same
                EXPECT_EQ(made.result, 0);
            } else if (expected[0] == '{') {
                EXPECT_EQ(made.string(), expected);
            } else {
                EXPECT_EQ(made.result, 6);
                EXPECT_FALSE(made.text);
                ASSERT_FALSE(logged.empty());
                EXPECT_EQ(logged.back(), critical(kMake, expected));
            }
        }
        EXPECT_EQ(heap_growth([&] {
                      faults::fail(c.function, c.calls);
                      { const Made made(record.get()); }
                      faults::clear();
                      log();
                  }),
                  0)
            << c.function;
    }
}

}  // namespace
