// SPDX-License-Identifier: Apache-2.0
//
// The calendar app: its texts and recurrences as functions, its commands as a person runs them.
#include <calendar_service.h>

#include <cstdlib>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>

#include "platform/calendar-service/app/agenda.h"
#include "platform/calendar-service/app/rule.h"
#include "platform/calendar-service/app/time_text.h"
#include "tests/support/device_test.h"

namespace {

using namespace calendar_text;
using ::testing::HasSubstr;
using Json = nlohmann::ordered_json;

// ---- Recurrences --------------------------------------------------------------------------------

Event event_at(const char* zone, const char* start, const char* length, const char* rule) {
    Event event;
    event.id = 1;
    event.title = "Event";
    event.start_zone = zone;
    const GivenTime given = parse_time(start).value();
    const Zone found = Zone::find(zone).value_or(Zone::utc());
    event.start = {!given.has_time, given.has_time ? given.in(found) : given.wall_s};
    const Duration lasting = parse_duration(length).value();
    event.end = {event.start.is_date, event.start.at_s + lasting.days * kDay_s + lasting.seconds};
    if (*rule != '\0') {
        EXPECT_EQ(set_rule(rule, found, &event), "") << rule;
    }
    return event;
}

Range days(const char* from, const char* to, const Zone& zone) {
    return make_range(zone.to_utc(parse_time(from).value().wall_s),
                      zone.to_utc(parse_time(to).value().wall_s), zone);
}

std::string starts_of(const Event& event, const Range& range, Warnings* warnings = nullptr) {
    Warnings unread;
    std::vector<Occurrence> found;
    const bool complete =
        expand(event, range, {}, &found, warnings == nullptr ? &unread : warnings);
    std::string text;
    for (const Occurrence& each : found) {
        text += (text.empty() ? "" : " ") + compact_text({event.is_all_day(), each.start_s});
    }
    return complete ? text : text + " incomplete";
}

TEST(QorCalendarRecurrence, RulesRunOnTheWallClockOfTheirZone) {
    struct Case {
        const char* name;
        const char* zone;
        const char* start;
        const char* rule;
        const char* from;
        const char* to;
        const char* expected;
    };
    const Case cases[] = {
        {"a skipped time has the offset before the change", "Europe/Berlin", "2014-03-01 02:30",
         "FREQ=DAILY", "2014-03-29", "2014-04-01",
         "20140329T013000Z 20140330T013000Z 20140331T003000Z"},
        {"a repeated time is the first of the two", "Europe/Berlin", "2014-10-01 02:30",
         "FREQ=DAILY", "2014-10-25", "2014-10-28",
         "20141025T003000Z 20141026T003000Z 20141027T013000Z"},
        {"the weekday is that of the zone, not of UTC", "Asia/Seoul", "2014-03-03 08:00",
         "FREQ=WEEKLY;BYDAY=MO,FR", "2014-03-03", "2014-03-15",
         "20140302T230000Z 20140306T230000Z 20140309T230000Z 20140313T230000Z"},
        {"count includes the start", "Etc/GMT", "2014-01-01 09:00", "FREQ=DAILY;COUNT=3",
         "2014-01-02", "2015-01-01", "20140102T090000Z 20140103T090000Z"},
        {"a start outside the rule is the first of the count", "Etc/GMT", "2014-01-01 09:00",
         "FREQ=WEEKLY;BYDAY=MO;COUNT=2", "2014-01-01", "2015-01-01",
         "20140101T090000Z 20140106T090000Z"},
        {"until is inclusive, an instant", "America/New_York", "2014-03-07 12:00",
         "FREQ=DAILY;UNTIL=20140309T160000Z", "2014-03-01", "2014-04-01",
         "20140307T170000Z 20140308T170000Z 20140309T160000Z"},
        {"until one second earlier", "America/New_York", "2014-03-07 12:00",
         "FREQ=DAILY;UNTIL=20140309T155959Z", "2014-03-01", "2014-04-01",
         "20140307T170000Z 20140308T170000Z"},
        {"an all-day until is a date, inclusive", "", "2014-03-29", "FREQ=DAILY;UNTIL=20140331",
         "2014-03-30", "2014-04-09", "20140330 20140331"},
        {"times of day do not touch an all-day event", "", "2014-03-29",
         "FREQ=DAILY;BYHOUR=9,10;COUNT=2", "2014-03-01", "2014-04-09", "20140329 20140330"},
        {"third Tuesday", "Etc/GMT", "2014-01-21 10:00", "FREQ=MONTHLY;BYDAY=3TU", "2014-02-01",
         "2014-04-30", "20140218T100000Z 20140318T100000Z 20140415T100000Z"},
        {"last workday", "Etc/GMT", "2014-01-31 10:00",
         "FREQ=MONTHLY;BYDAY=MO,TU,WE,TH,FR;BYSETPOS=-1", "2014-05-01", "2014-07-01",
         "20140530T100000Z 20140630T100000Z"},
        {"the 31st only where there is one", "Etc/GMT", "2014-01-31 10:00", "FREQ=MONTHLY",
         "2014-02-01", "2014-06-01", "20140331T100000Z 20140531T100000Z"},
        {"leap day", "", "2012-02-29", "FREQ=YEARLY", "2013-01-01", "2021-01-01",
         "20160229 20200229"},
        {"every other week, far on", "Etc/GMT", "2014-01-06 10:00",
         "FREQ=WEEKLY;INTERVAL=2;BYDAY=MO,SU;WKST=SU", "2030-01-01", "2030-01-20",
         "20300113T100000Z 20300114T100000Z"},
        {"a week number in the range's first year", "Europe/Berlin", "2010-01-31 09:30",
         "FREQ=YEARLY;BYWEEKNO=1,20,53;BYDAY=MO", "2013-04-10", "2013-05-20", "20130513T073000Z"},
        {"daily since 1970, eighty years on", "Etc/GMT", "1970-01-01 00:00", "FREQ=DAILY",
         "2050-06-01", "2050-06-03", "20500601T000000Z 20500602T000000Z"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        const Event event = event_at(c.zone, c.start, *c.zone == '\0' ? "1d" : "1h", c.rule);
        EXPECT_EQ(starts_of(event, days(c.from, c.to, *Zone::find(c.zone))), c.expected);
    }
}

TEST(QorCalendarRecurrence, CancelledOccurrencesAreReadHoweverTheyAreWritten) {
    Event timed = event_at("Europe/Berlin", "2014-03-14 10:30", "1h", "FREQ=DAILY;COUNT=5");
    timed.exdate = "20140315T093000Z, 20140317T093000Z ,,nonsense,20140316T093001Z";
    Event all_day = event_at("", "2014-03-14", "1d", "FREQ=DAILY;COUNT=5");
    all_day.exdate = "20140315T000000Z, 20140316,20140317T093000";
    const Range range = days("2014-03-01", "2014-04-01", Zone::utc());
    Warnings warnings;
    EXPECT_EQ(starts_of(timed, range, &warnings),
              "20140314T093000Z 20140316T093000Z 20140318T093000Z");
    EXPECT_EQ(warnings.size(), 1U);
    EXPECT_EQ(starts_of(all_day, range), "20140314 20140318");
}

TEST(QorCalendarRecurrence, ARangeHoldsWhatOverlapsIt) {
    const Zone seoul = *Zone::find("Asia/Seoul");
    const Range day = days("2014-03-15", "2014-03-16", seoul);
    struct Case {
        const char* start;
        const char* length;
        bool is_inside;
    };
    const Case cases[] = {
        {"2014-03-14 23:30", "30m", false}, {"2014-03-14 23:30", "31m", true},
        {"2014-03-15 00:00", "0m", true},   {"2014-03-16 00:00", "1h", false},
        {"2014-03-14", "1d", false},        {"2014-03-13", "3d", true},
        {"2014-03-15", "0d", true},  // an end at the start means one day
        {"2014-03-16", "1d", false},
    };
    for (const Case& c : cases) {
        const std::string found = starts_of(event_at("Asia/Seoul", c.start, c.length, ""), day);
        EXPECT_EQ(!found.empty(), c.is_inside) << c.start << " " << c.length;
    }
}

// A hang ends with the time limit of every test.
TEST(QorCalendarRecurrence, NoStoredValueMakesItHangOrCrash) {
    const std::string minutes = [] {
        std::string list = "0";
        for (int i = 1; i < 60; ++i) {
            list += "," + std::to_string(i);
        }
        return list;
    }();
    const Range range = days("2014-01-01", "2014-01-02", Zone::utc());
    Event often = event_at("Etc/GMT", "1970-01-01 00:00", "0m", "FREQ=DAILY");
    often.byhour = "0,1,2,3,4,5,6,7,8,9,10,11,12,13,14,15,16,17,18,19,20,21,22,23";
    often.byminute = minutes;
    often.bysecond = minutes;
    EXPECT_EQ(starts_of(often, range).size(), 86400U * 17 - 1);  // one blank fewer than texts
    often.bymonth = "2";
    often.bymonthday = "31";
    EXPECT_EQ(starts_of(often, range), "");
    often.range_type = CALENDAR_RANGE_COUNT;
    often.count = 5;
    EXPECT_EQ(starts_of(often, range), " incomplete");

    const Range whole = days("1970-01-01", "2100-01-01", Zone::utc());
    for (const char* byday : {"XX", "MO;COUNT=2", "", "99MO", ",,,"}) {
        Event odd = event_at("Etc/GMT", "2014-01-01 00:00", "1h", "FREQ=WEEKLY;COUNT=2");
        odd.byday = byday;
        odd.interval = 0;
        odd.week_start = -1;
        EXPECT_EQ(starts_of(odd, whole),
                  *byday == '\0' ? "20140101T000000Z 20140108T000000Z" : "20140101T000000Z")
            << byday;
    }
    Event extreme = event_at("Mars/Base", "2014-01-01 00:00", "1h", "FREQ=YEARLY;INTERVAL=32767");
    extreme.end.at_s = kLatest_s;
    extreme.range_type = CALENDAR_RANGE_COUNT;
    extreme.count = -3;
    Warnings warnings;
    EXPECT_EQ(starts_of(extreme, whole, &warnings), "20140101T000000Z");
    EXPECT_EQ(warnings, Warnings({"event 1: unknown time zone \"Mars/Base\", using UTC"}));
}

// ---- Texts --------------------------------------------------------------------------------------

TEST(QorCalendarText, RulesAreReadWrittenAndRefused) {
    struct Case {
        const char* rule;
        const char* written;  // null: refused
    };
    const Case timed_cases[] = {
        {"FREQ=DAILY", "FREQ=DAILY"},
        {"RRULE:freq=weekly;wkst=mo;byday=mo, we;interval=2",
         "FREQ=WEEKLY;INTERVAL=2;BYDAY=MO,WE;WKST=MO"},
        {"FREQ=DAILY;UNTIL=20140401", "FREQ=DAILY;UNTIL=20140401T215959Z"},
        {"FREQ=DAILY;UNTIL=20140401T120000", "FREQ=DAILY;UNTIL=20140401T100000Z"},
        {"FREQ=DAILY;UNTIL=20140401T120000Z", "FREQ=DAILY;UNTIL=20140401T120000Z"},
        {"FREQ=YEARLY;COUNT=2;BYSETPOS=-1;BYMONTH=3;BYDAY=SU",
         "FREQ=YEARLY;BYDAY=SU;BYMONTH=3;BYSETPOS=-1;COUNT=2"},
        {"FREQ=HOURLY", nullptr},
        {"BYDAY=MO", nullptr},
        {"FREQ=DAILY;COUNT=0", nullptr},
        {"FREQ=DAILY;COUNT=2x", nullptr},
        {"FREQ=DAILY;COUNT=2;UNTIL=20140401", nullptr},
        {"FREQ=DAILY;INTERVAL=32768", nullptr},
        {"FREQ=DAILY;FREQ=WEEKLY", nullptr},
        {"FREQ=DAILY;BYDAY=XX", nullptr},
        {"FREQ=DAILY;BYHOUR=24", nullptr},
        {"FREQ=DAILY;BYDAY=", nullptr},
        {"FREQ=DAILY;UNTIL=20140231", nullptr},
        {"FREQ=DAILY;WKST=XX", nullptr},
        {"FREQ=DAILY;BYDAYS=MO", nullptr},
    };
    const Zone berlin = *Zone::find("Europe/Berlin");
    for (const Case& c : timed_cases) {
        SCOPED_TRACE(c.rule);
        Event event = event_at("Europe/Berlin", "2014-03-14 10:30", "1h", "FREQ=MONTHLY;COUNT=7");
        const Event before = event;
        const std::string wrong = set_rule(c.rule, berlin, &event);
        EXPECT_EQ(wrong.empty(), c.written != nullptr) << wrong;
        EXPECT_EQ(rule_text(event), c.written != nullptr ? c.written : rule_text(before));
    }
}

TEST(QorCalendarText, TimesAndDurationsAreReadInEveryUsualForm) {
    struct Case {
        const char* text;
        const char* instant;  // in Berlin; null: refused
    };
    const Case times[] = {
        {"2014-03-15", "20140314T230000Z"},
        {" 20140315 ", "20140314T230000Z"},
        {"2014-03-15 09:30", "20140315T083000Z"},
        {"20140315T093015", "20140315T083015Z"},
        {"20140315T093000Z", "20140315T093000Z"},
        {"2014-03-15T09:30Z", "20140315T093000Z"},
        {"2014-03-15T0930Z", "20140315T093000Z"},
        {"2014-03-15T09:30:00-05:30", "20140315T150000Z"},
        {"2014-02-29", nullptr},
        {"2014-13-01", nullptr},
        {"0000-01-01", nullptr},
        {"2014-03-15 24:00", nullptr},
        {"2014-03-15 09:60", nullptr},
        {"2014-03-15 9:30", nullptr},
        {"2014-03-15T", nullptr},
        {"2014-03-15 09:30 am", nullptr},
        {"tomorrow", nullptr},
        {"", nullptr},
    };
    const Zone berlin = *Zone::find("Europe/Berlin");
    for (const Case& c : times) {
        const std::optional<GivenTime> given = parse_time(c.text);
        EXPECT_EQ(given ? compact_text({false, given->in(berlin)}) : "refused",
                  c.instant != nullptr ? c.instant : "refused")
            << c.text;
    }
    const std::pair<const char*, const char*> durations[] = {
        {"PT1H30M", "1h30m"}, {"1h30m", "1h30m"},    {"90", "1h30m"},
        {"P2W", "14d"},       {"1d12h", "1d12h"},    {"PT45S", "45s"},
        {"0m", "0m"},         {"-PT15M", "refused"}, {"1h30", "refused"},
        {"h", "refused"},     {"", "refused"},       {"99999999999999999999d", "refused"},
        {"P", "refused"},
    };
    for (const auto& [text, expected] : durations) {
        const std::optional<Duration> given = parse_duration(text);
        EXPECT_EQ(given ? duration_text(given->days * kDay_s + given->seconds) : "refused",
                  expected)
            << text;
    }
}

// ---- Agenda -------------------------------------------------------------------------------------

TEST(QorCalendarAgenda, DevicesThatKeepAnExceptionDifferentlyShowTheSame) {
    const Zone berlin = *Zone::find("Europe/Berlin");
    const Range range = days("2014-03-01", "2014-04-01", berlin);
    Event parent = event_at("Europe/Berlin", "2014-03-14 10:30", "1h", "FREQ=DAILY;COUNT=3");
    Event exception = event_at("Europe/Berlin", "2014-03-20 08:00", "2h", "");
    exception.id = 2;
    exception.parent_id = 1;
    exception.recurrence_id = "20140315T093000Z";
    Event holiday = event_at("", "2014-03-20", "1d", "");
    holiday.id = 3;
    const auto json_of = [&](const std::vector<Event>& events) {
        return agenda_json(make_agenda(events, range, berlin));
    };

    // Only the exception; the exception and the list; the list and an event of its own.
    const Json only_exception = json_of({parent, exception, holiday});
    parent.exdate = "20140315T093000Z";
    const Json both = json_of({holiday, parent, exception});
    exception.id = 7;
    exception.parent_id = 0;
    exception.recurrence_id.reset();
    parent.location = "";
    const Json documents = json_of({exception, parent, holiday});
    EXPECT_EQ(only_exception.dump(), both.dump());
    EXPECT_EQ(both.dump(), documents.dump());
    std::string starts;
    for (const auto& entry : documents) {
        starts += entry["start"].get<std::string>() + " ";
    }
    EXPECT_EQ(starts,
              "2014-03-14T10:30:00+01:00 2014-03-16T10:30:00+01:00 2014-03-20 "
              "2014-03-20T08:00:00+01:00 ");

    parent.exdate.reset();
    exception.parent_id = 1;
    exception.recurrence_id = "soon";
    const std::vector<Event> events = {exception, parent};
    const Agenda unreadable = make_agenda(events, range, berlin);
    EXPECT_EQ(unreadable.entries.size(), 4U);  // nothing is replaced, nothing is lost
    EXPECT_EQ(unreadable.warnings.size(), 1U);
}

// ---- Commands -----------------------------------------------------------------------------------

struct Ran {
    int exit = -1;
    std::string out;
    std::string err;

    Json json() const { return Json::parse(out); }
};

std::string content_of(const std::string& file) {
    std::ifstream in(file);
    std::stringstream text;
    text << in.rdbuf();
    return text.str();
}

class QorCalendarTest : public DeviceTest {
  protected:
    // Runs the app in Berlin with arguments as a shell reads them.
    static Ran run(const std::string& arguments) {
        const std::string line =
            "TZ=Europe/Berlin " QOR_BIN_DIR "/qor-calendar " + arguments + " >out.txt 2>err.txt";
        const int status = std::system(line.c_str());
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, content_of("out.txt"),
                content_of("err.txt")};
    }

    static std::string starts(const std::string& arguments) {
        std::string text;
        for (const auto& entry : run("agenda --json " + arguments).json()) {
            text += entry["start"].get<std::string>() + " ";
        }
        return text;
    }

    static void add_stand_up() {
        const Ran added = run(
            "add --title Stand-up --start '2014-03-24 09:30' --duration 30m --zone Europe/Berlin "
            "--rrule 'FREQ=WEEKLY;BYDAY=MO,WE' --alarm 15m --alarm 1d --location 'Room 1'");
        ASSERT_EQ(added.exit, 0) << added.err;
        EXPECT_EQ(added.out,
                  "Added event 1 \"Stand-up\" to book 1: Mon 2014-03-24 09:30-10:00 "
                  "Europe/Berlin, repeats FREQ=WEEKLY;BYDAY=MO,WE.\n");
    }
};

TEST_F(QorCalendarTest, OccurrencesAreCancelledMovedAndShownInTheirPlace) {
    add_stand_up();
    EXPECT_EQ(run("cancel 1 2014-03-26").out,
              "Cancelled the occurrence 2014-03-26 09:30 of event 1 \"Stand-up\".\n");
    EXPECT_EQ(run("cancel 1 2014-03-26 --json").json()["action"], "unchanged");
    const Ran moved = run("move 1 '2014-03-31 09:30' --start '2014-04-01 11:00' --title Late");
    EXPECT_EQ(moved.exit, 0) << moved.err;
    EXPECT_EQ(moved.out,
              "Moved the occurrence 2014-03-31 09:30 of event 1 \"Stand-up\" to Tue 2014-04-01 "
              "11:00-11:30: event 2 \"Late\".\n");
    EXPECT_EQ(starts("2014-03-24 2014-04-02"),
              "2014-03-24T09:30:00+01:00 2014-04-01T11:00:00+02:00 2014-04-02T09:30:00+02:00 ");

    ASSERT_EQ(calendar_connect(), 0);
    EXPECT_EQ(text(read(1), _calendar_event.exdate), "20140326T083000Z,20140331T073000Z");
    const Record exception = read(2);
    EXPECT_EQ(text(exception, _calendar_event.recurrence_id), "20140331T073000Z");
    EXPECT_EQ(number(exception, _calendar_event.original_event_id), 1);
    EXPECT_EQ(number(exception, _calendar_event.freq), 0);
    EXPECT_EQ(number(exception, _calendar_event.has_alarm), 1);
    EXPECT_EQ(text(exception, _calendar_event.exdate), "(null)");

    // By its original day it is moved again, cancelled for good, and not moved after that.
    EXPECT_EQ(run("move 1 2014-03-31 --start '2014-04-03 08:00'").exit, 0);
    EXPECT_EQ(run("show 1 --json").json()["exceptions"].size(), 1U);
    EXPECT_EQ(run("cancel 1 2014-03-31").exit, 0);
    EXPECT_EQ(read(2), nullptr);
    EXPECT_EQ(text(read(1), _calendar_event.exdate), "20140326T083000Z,20140331T073000Z");
    EXPECT_EQ(run("move 1 2014-03-31 --start '2014-04-03 08:00'").exit, 3);
    EXPECT_EQ(starts("2014-03-24 2014-04-03"),
              "2014-03-24T09:30:00+01:00 2014-04-02T09:30:00+02:00 ");

    // An exception that came without the list entry leaves one when it is deleted.
    EXPECT_EQ(run("move 1 2014-04-07 --start '2014-04-08 08:00'").exit, 0);
    set_text(1, _calendar_event.exdate, nullptr);
    EXPECT_EQ(run("delete 3").exit, 0);
    EXPECT_EQ(text(read(1), _calendar_event.exdate), "20140407T073000Z");
    EXPECT_EQ(calendar_disconnect(), 0);
}

TEST_F(QorCalendarTest, EditingChangesWhatIsGivenAndCarriesExceptionsAlong) {
    add_stand_up();
    ASSERT_EQ(run("cancel 1 2014-03-26").exit, 0);
    ASSERT_EQ(run("move 1 2014-04-02 --start '2014-04-03 11:00'").exit, 0);
    const Ran edited = run("edit 1 --start '2014-03-24 10:30' --location 'Room 2' --unset alarms");
    EXPECT_EQ(edited.out,
              "Changed event 1 \"Stand-up\".\n"
              "  when: Mon 2014-03-24 09:30-10:00 -> Mon 2014-03-24 10:30-11:00\n"
              "  location: Room 1 -> Room 2\n"
              "  alarms: 15m before, 1d before -> none\n"
              "  cancelled: 2014-03-26 09:30, 2014-04-02 09:30 -> 2014-03-26 10:30, 2014-04-02 "
              "10:30\n");
    EXPECT_EQ(starts("2014-03-24 2014-04-03"),
              "2014-03-24T10:30:00+01:00 2014-03-31T10:30:00+02:00 2014-04-03T11:00:00+02:00 ");
    EXPECT_EQ(run("show 2 --json").json()["occurrence"], "20140402T083000Z");
    EXPECT_EQ(run("show 1 --json").json()["rrule"], "FREQ=WEEKLY;BYDAY=MO,WE");

    struct Case {
        const char* options;
        const char* start;
        const char* end;
    };
    const Case cases[] = {
        {"--zone America/New_York", "2014-03-24T10:30:00-04:00", "2014-03-24T11:00:00-04:00"},
        {"--start 2014-03-29", "2014-03-29T10:30:00-04:00", "2014-03-29T11:00:00-04:00"},
        {"--duration 1d --zone Europe/Berlin", "2014-03-29T10:30:00+01:00",
         "2014-03-30T10:30:00+02:00"},  // a day on the clock, across the change
        {"--all-day", "2014-03-29", "2014-03-31"},
        {"--end 2014-03-29", "2014-03-29", "2014-03-30"},
        {"--start '2014-03-29 23:00'", "2014-03-29T23:00:00+01:00", "2014-03-30T00:00:00+01:00"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.options);
        const Json event = run(std::string("edit 1 --json ") + c.options).json()["event"];
        EXPECT_EQ(event["start"], c.start);
        EXPECT_EQ(event["end"], c.end);
    }
    EXPECT_EQ(run("edit 1 --title Stand-up").out, "Nothing to change in event 1 \"Stand-up\".\n");
}

TEST_F(QorCalendarTest, EveryDetailIsStoredAndTablesLineUp) {
    const Ran added =
        run("--json add --title '회의 — \x1b[31m' --start 2014-08-04 --duration 2w --place "
            "37.5,-122.25 "
            "--organizer 'Ann <ann@example.org>' --description 'a\nb' --alarm 90");
    ASSERT_EQ(added.exit, 0) << added.err;
    EXPECT_EQ(added.json()["event"],
              Json::parse(R"({"id":1,"book":1,"title":"회의 — \u001b[31m","all_day":true,
                  "start":"2014-08-04","end":"2014-08-18","description":"a\nb","organizer":"Ann",
                  "place":"37.500000,-122.250000","alarms":[90]})"));
    ASSERT_EQ(run("add --title Lunch --start '2014-08-05 12:00' --location Küche").exit, 0);
    EXPECT_EQ(run("agenda 2014-08-05 2014-08-05").out,
              "WHEN                                      TITLE         LOCATION  EVENT\n"
              "Mon 2014-08-04 - Sun 2014-08-17, 14 days  회의 —  [31m            1\n"
              "Tue 2014-08-05 12:00-13:00                Lunch         Küche     2\n");
    EXPECT_EQ(run("show 1").out,
              "title        회의 —  [31m\n"
              "when         Mon 2014-08-04 - Sun 2014-08-17, 14 days\n"
              "description  a b\n"
              "organizer    Ann <ann@example.org>\n"
              "place        37.500000,-122.250000\n"
              "alarms       1h30m before\n"
              "book         1\n");
    EXPECT_EQ(run("edit 1 --unset place --unset organizer --json").json()["changed"],
              Json::parse(R"(["organizer","place"])"));
}

TEST_F(QorCalendarTest, NewEventsGoToTheAccountsBook) {
    ASSERT_EQ(run("add --title A --start 2014-08-04").exit, 0);
    EXPECT_EQ(run("books --json").json(), Json::parse(R"([{"id":1,"name":"My Calendar",
        "holds":"events","account":0,"description":""}])"));
    ASSERT_EQ(calendar_connect(), 0);
    const int book = add_book(5);
    EXPECT_EQ(calendar_disconnect(), 0);
    EXPECT_EQ(run("add --title B --start 2014-08-04 --json").json()["event"]["book"], book);
    EXPECT_EQ(run("list --book 1 --json").json().size(), 1U);
    EXPECT_EQ(run("edit 1 --json --book " + std::to_string(book)).json()["event"]["book"], book);

    EXPECT_EQ(run("--device other/new list").out, "No events; see 'qor-calendar add --help'.\n");
    EXPECT_TRUE(std::filesystem::is_directory("other/new/opt/usr/dbspace"));
    EXPECT_TRUE(std::filesystem::is_directory("other/new/opt/usr/data/cloud-qor"));
}

TEST_F(QorCalendarTest, BadInputIsRefusedWithTheNextStep) {
    add_stand_up();
    ASSERT_EQ(run("add --title Once --start 2014-08-04").exit, 0);
    struct Case {
        const char* arguments;
        int exit;
        const char* message;
    };
    const Case cases[] = {
        {"", 2, "no command given; see 'qor-calendar --help'"},
        {"agnda", 2, "unknown command \"agnda\"; did you mean 'agenda'?"},
        {"list --jsn", 2, "list: unexpected \"--jsn\"; did you mean '--json'?"},
        {"add --titel X --start 2014-01-01", 2, "add: --title is required"},
        {"add --title X --start 2014-01-01 --ala 5", 2, "did you mean '--alarm'?"},
        {"add --title X --start soon", 2, "--start: \"soon\" is no date or time"},
        {"add --title X --start 2014-02-30", 2, "--start: \"2014-02-30\""},
        {"add --title X --start '2014-01-01 10:00' --all-day", 2, "has a time"},
        {"add --title X --start '2014-01-01 10:00' --end 2014-01-02", 2, "a date and a time"},
        {"add --title X --start 2014-01-02 --end 2014-01-01", 2, "the end is before the start"},
        {"add --title X --start 2014-01-02 --duration 1h", 2, "whole days"},
        {"add --title X --start 2014-01-02 --duration 1d --end 2014-01-03", 2, "exclude"},
        {"add --title X --start 9999-12-31 --duration 2d", 2, "after the year 9999"},
        {"add --title X --start '2014-01-01 10:00' --zone Europe/Berln", 2,
         "unknown time zone \"Europe/Berln\"; did you mean Europe/Berlin?"},
        {"add --title X --start 2014-01-01 --rrule FREQ=HOURLY", 2, "--rrule: FREQ \"HOURLY\""},
        {"add --title X --start 2014-01-01 --rrule 'FREQ=DAILY;CONT=2'", 2, "did you mean COUNT?"},
        {"add --title X --start 2014-01-01 --alarm 1h30s", 2, "--alarm: \"1h30s\""},
        {"add --title X --start 2014-01-01 --place 91,0", 2, "--place: \"91\""},
        {"add --title X --start 2014-01-01 --place 1,nan", 2, "--place: \"nan\""},
        {"add --title $(printf '\\377') --start 2014-01-01", 2, "--title: the text is not UTF-8"},
        {"add --title X --start 2014-01-01 --book 9", 3, "there is no book 9"},
        {"edit 1", 2, "nothing to change in event 1"},
        {"edit 1 --unset colour", 2, "--unset: \"colour\" cannot be removed; one of alarms"},
        {"edit 9 --title X", 3, "there is no event 9; see 'qor-calendar list'"},
        {"show x", 2, "\"x\" is no event id"},
        {"show 99999999999", 2, "is no event id"},
        {"delete", 2, "delete: ID is required"},
        {"delete 8 9", 3, "there is no event 8"},
        {"cancel 2 2014-08-04", 3, "event 2 \"Once\" does not repeat"},
        {"cancel 1 2014-03-25", 3,
         "no occurrence at 2014-03-25; the next are 2014-03-26 09:30, 2014-03-31 09:30"},
        {"cancel 1 '2014-03-26 09:31'", 3, "no occurrence at 2014-03-26 09:31"},
        {"move 1 2014-03-26", 2, "move: --start is required"},
        {"agenda 2014-01-02 2014-01-01", 2, "TO: \"2014-01-01\" is not after FROM"},
        {"agenda then", 2, "FROM: \"then\""},
        {"--device /proc/none list", 3, "cannot make the folder"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.arguments);
        const Ran ran = run(c.arguments);
        EXPECT_EQ(ran.exit, c.exit);
        EXPECT_EQ(ran.out, "");
        EXPECT_EQ(ran.err.find("qor-calendar: error: "), 0U);
        EXPECT_THAT(ran.err, HasSubstr(c.message));
    }
    EXPECT_EQ(run("list --json").json().size(), 2U);

    const Ran partly = run("delete 9 2");
    EXPECT_EQ(partly.exit, 1);
    EXPECT_EQ(partly.out, "Deleted event 2 \"Once\".\n");
    EXPECT_THAT(partly.err, HasSubstr("there is no event 9"));
    EXPECT_EQ(run("--help").exit, 0);
    EXPECT_THAT(run("move --help").out, HasSubstr("qor-calendar move 3 2014-03-19"));
}

TEST_F(QorCalendarTest, UnknownZonesAreReadAsUtcWithAWarning) {
    add_stand_up();
    ASSERT_EQ(calendar_connect(), 0);
    set_text(1, _calendar_event.start_tzid, "Mars/Base");
    EXPECT_EQ(calendar_disconnect(), 0);
    const Ran agenda = run("agenda 2014-03-24 2014-04-02 --json");
    EXPECT_EQ(agenda.exit, 0);
    EXPECT_EQ(agenda.err,
              "qor-calendar: warning: event 1: unknown time zone \"Mars/Base\", using UTC\n");
    EXPECT_EQ(agenda.json()[3]["start"], "2014-04-02T08:30:00Z");
}

}  // namespace
