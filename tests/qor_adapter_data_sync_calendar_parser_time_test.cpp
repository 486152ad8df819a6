// SPDX-License-Identifier: Apache-2.0
#include <unicode/udat.h>
#include <unicode/ustring.h>

#include <climits>
#include <cstdlib>
#include <ctime>

#include "tests/parser_test.h"

namespace {

using TimeTest = ParserTest;

constexpr int64_t kMax = INT64_MAX;
constexpr int64_t kMin = INT64_MIN;

// clang-format off
TEST_F(TimeTest, AnInstantIsWrittenInItsZone) {
    const struct {
        const char* zone;
        int64_t seconds;
        bool all_day;
        std::string text;
    } cases[] = {
        {nullptr, 0, false, "19700101T000000Z"},
        {nullptr, 0, true, "19700101"},
        {"Asia/Tokyo", 0, false, "19700101T090000"},
        {"America/New_York", 0, true, "19691231"},
        {"Etc/GMT+9", 0, false, "19691231T150000Z"},  // the prefix decides
        {"UTC", -1, false, "19691231T235959"},
        {"Etc/GMT", 253402300800, false, "100000101T000000Z"},
        {"Etc/GMT", kMax, false, "58289631220T000000Z"},  // where ICU's calendar ends
        {"Etc/GMT", kMin, false, "58382700920T000000Z"},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(taken(_qor_calendar_convert_ltos(c.zone, c.seconds, c.all_day)), c.text);
    }
}

TEST_F(TimeTest, ATextIsReadInTheZoneThatTheCallerNames) {
    const struct {
        const char* zone;
        const char* text;
        int64_t seconds;
    } cases[] = {
        {"Etc/GMT", "20140315T093000Z", 1394875800},
        {"Etc/GMT", "20140315T093000", 1394875800},
        {nullptr, "20140315", 1394841600},
        {"Asia/Tokyo", "20140315T093000Z", 1394843400},       // the Z does not count
        {"Etc/GMT+9", "20140315T093000Z", 1394908200},
        {"Etc/GMT", "20140315 0930", 1394875800},             // what is missing is 0
        {"Etc/GMT", "201403150", 1394841600},
        {"Etc/GMT", "20140230", 1393718400},                  // rolls over
        {"Etc/GMT", "20141331T256199Z", 1422756159},
        {"America/New_York", "20140309T023000", 1394350200},  // skipped: 03:30
        {"America/New_York", "20141102T013000", 1414909800},  // happens twice: the second
        {"Australia/Lord_Howe", "20140406T014500", 1396710900},
        {"Pacific/Apia", "20111230T120000", 1325282400},      // a day that was left out
    };
    for (const auto& c : cases) {
        EXPECT_EQ(_qor_calendar_convert_stol(c.zone, c.text), c.seconds) << c.text;
    }
    EXPECT_EQ(logged(), "");
    EXPECT_EQ(_qor_calendar_convert_stol(nullptr, nullptr), _qor_calendar_convert_stol("UTC", ""));
    EXPECT_EQ(logged(), "_qor_calendar_convert_stol: no text");
}
// clang-format on

// Truncation toward zero makes an instant before 1970 one second late, but for the one moment in a
// thousand that has no milliseconds.
TEST_F(TimeTest, BeforeTheEpochTheMillisecondsOfTheMomentShow) {
    int late = 0;
    for (int i = 0; i < 3; ++i) {
        const int64_t seconds = _qor_calendar_convert_stol("Etc/GMT", "19691231T235950Z");
        late += seconds == -9 ? 1 : 0;
        EXPECT_THAT(seconds, ::testing::AnyOf(-9, -10));
    }
    EXPECT_GE(late, 1);
}

std::string formatted_by_icu(const char* zone, int64_t seconds) {
    UChar text[64];
    u_uastrcpy(text, zone);
    UErrorCode status = U_ZERO_ERROR;
    UDateFormat* format =
        udat_open(UDAT_PATTERN, UDAT_PATTERN, "en_US", text, -1, u"yyyyMMdd'T'HHmmss", -1, &status);
    udat_format(format, static_cast<double>(seconds) * 1000, text, 64, nullptr, &status);
    udat_close(format);
    char narrow[64];
    return U_SUCCESS(status) ? u_austrcpy(narrow, text) : u_errorName(status);
}

std::string formatted_by_the_c_library(time_t seconds) {
    std::tm fields{};
    char text[64];
    localtime_r(&seconds, &fields);
    return {text, std::strftime(text, sizeof(text), "%Y%m%dT%H%M%S", &fields)};
}

TEST_F(TimeTest, InstantsAgreeWithTwoOtherCalendarsFrom1906To2223) {
    for (const char* zone : {"America/New_York", "America/St_Johns", "America/Sao_Paulo",
                             "Europe/London", "Asia/Tokyo", "Asia/Kathmandu", "Pacific/Apia",
                             "Australia/Lord_Howe", "Pacific/Chatham", "Antarctica/Troll"}) {
        setenv("TZ", zone, 1);
        tzset();
        for (int64_t t = -2000000000; t < 8000000000; t += 30654321) {
            const std::string text = taken(_qor_calendar_convert_ltos(zone, t, false));
            ASSERT_EQ(text, formatted_by_the_c_library(t)) << zone << ' ' << t;
            ASSERT_EQ(text, formatted_by_icu(zone, t)) << zone << ' ' << t;
            // Back to the instant, or to the other one of this wall-clock time.
            const int64_t back = _qor_calendar_convert_stol(zone, text.c_str());
            ASSERT_TRUE(back == t || (t < 0 && back == t + 1) ||
                        formatted_by_the_c_library(back) == text)
                << zone << ' ' << t << ' ' << back;
        }
    }
    unsetenv("TZ");
    EXPECT_EQ(logged(), "");
}

TEST_F(TimeTest, AMillisecondTextKeepsTheKindOfTheValue) {
    struct Case {
        calendar_time_s value;
        const char* text;
        std::string told;
    };
    for (Case c : std::initializer_list<Case>{
             {instant(7), "1394875800000", "1394875800"},
             {instant(7), "-1500", "-1"},
             {instant(7), "1999x", "1"},
             {instant(7), "99999999999999999999", "9223372036854776"},
             {date(2000, 1, 1), "1394875800000", "2014-3-15 0:0:0"},
             {date(2000, 1, 1), "-86400001", "1969-12-31 0:0:0"},
             {instant(7), nullptr, "7"},
         }) {
        EXPECT_EQ(_qor_calendar_parse_caltime(1, c.text, &c.value), 0);
        EXPECT_EQ(told(c.value), c.told);
    }
    EXPECT_EQ(_qor_calendar_parse_caltime(0, "1", nullptr), 0);
    const std::string no_text = "_qor_calendar_parse_caltime: no text or no value";
    EXPECT_EQ(logged(), no_text + " | " + no_text);
}

TEST_F(TimeTest, AnAllDayValueIsTheDateInUtc) {
    struct Case {
        calendar_time_s value;
        std::string told;
    };
    for (Case c : std::initializer_list<Case>{{instant(1394927999), "2014-3-15 0:0:0"},
                                              {instant(-1), "1969-12-31 0:0:0"},
                                              {date(2014, 13, 32), "2014-13-32 0:0:0"},
                                              {instant(kMax), "5828963-12-20 0:0:0"},
                                              {instant(kMin), "5838270-9-20 0:0:0"}}) {
        EXPECT_EQ(_qor_calendar_set_allday(0, &c.value), 0);
        EXPECT_EQ(told(c.value), c.told);
    }
    EXPECT_EQ(_qor_calendar_set_allday(0, nullptr), -1);
}

// clang-format off
TEST_F(TimeTest, ADurationAddsSecondsToAnInstantAndDaysToADate) {
    const struct {
        const char* duration;
        int64_t seconds;
        const char* date;  // from 2014-02-27
    } cases[] = {
        {"P1W", 604800, "2014-3-6"},
        {"P2D", 172800, "2014-3-1"},
        {"PT1H30M", 5400, "2014-2-27"},
        {"-PT15M", 900, "2014-2-27"},          // the sign is skipped
        {"P1DT12H", 129600, "2014-2-27"},      // a part of a day sets the days back
        {"PT12H1D", 129600, "2014-2-28"},
        {"P1W1DT1S\nP1D", 691201, "2014-2-27"},
        {"P1D1234567", 86400, "2014-2-28"},
        {"P1D12345678D", 86400, "2014-2-28"},  // eight digits end the scan
        {"PT123456789S", 0, "2014-2-27"},
        {"P1234567S", 1234567, "2014-2-27"},
        {"12P3D", 2764800, "2014-3-31"},    // P keeps the digits before it
        {"p1d", 0, "2014-2-27"},  // no designators
        {"P1x2D", 86400, "2014-2-28"},
        {"", 0, "2014-2-27"},
        {nullptr, 0, "2014-2-27"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.duration ? c.duration : "null");
        const Record timed = new_event(instant(1000000));
        const Record all_day = new_event(date(2014, 2, 27));
        EXPECT_EQ(__qor_calendar_get_day(c.duration, timed.get()), 0);
        EXPECT_EQ(__qor_calendar_get_day(c.duration, all_day.get()), 0);
        EXPECT_EQ(told_time(timed, _calendar_event.end_time), std::to_string(1000000 + c.seconds));
        EXPECT_EQ(told_time(all_day, _calendar_event.end_time), c.date + std::string(" 0:0:0"));
    }
    EXPECT_EQ(logged(), "");
}
// clang-format on

TEST_F(TimeTest, ADurationStopsAtTheLimits) {
    const auto end = [](const calendar_time_s& start, const std::string& duration) {
        const Record event = new_event(start);
        EXPECT_EQ(__qor_calendar_get_day(duration.c_str(), event.get()), 0);
        return told_time(event, _calendar_event.end_time);
    };
    EXPECT_EQ(end(instant(kMax - 1), "PT5S"), std::to_string(kMax));
    calendar_time_s start = date(2014, 12, 31);
    start.time.date.hour = 7;
    start.time.date.is_leap_month = true;
    EXPECT_EQ(end(start, "P1D"), "2015-1-1 7:0:0 leap");
    EXPECT_EQ(logged(), "");
    EXPECT_EQ(end(instant(0), "P5000WT1S"), std::to_string(INT_MAX));
    EXPECT_EQ(logged(), "__qor_calendar_get_day: duration too long [P5000WT1S], cut to 2147483647");
    std::string weeks;
    for (int i = 0; i < 40; ++i) {
        weeks += "9999999W";
    }
    end(date(INT_MIN, INT_MIN, INT_MIN), weeks);
    EXPECT_THAT(logged(), ::testing::EndsWith(", cut to 2147483647"));
}

TEST_F(TimeTest, AnUnknownZoneIsReportedAndTakenAsUtc) {
    for (const std::string& zone : {std::string("Mars/Olympus"), std::string(),
                                    std::string("\xff\xfe"), std::string(100000, 'x')}) {
        const std::string line =
            "__qor_calendar_get_ucal: unknown zone [" + zone.substr(0, 64) + "], taken as UTC";
        EXPECT_EQ(_qor_calendar_convert_stol(zone.c_str(), "20140315T093000Z"), 1394875800);
        EXPECT_EQ(logged(), line);
        EXPECT_EQ(taken(_qor_calendar_convert_ltos(zone.c_str(), 0, false)), "19700101T000000");
        EXPECT_EQ(logged(), line);
    }
}

TEST_F(TimeTest, OnlyEventRecordsAreOfTheEventKind) {
    const Record event = new_event();
    EXPECT_EQ(__qor_calendar_get_record_type(event.get()), 0);
    for (const char* uri : {_calendar_todo._uri, _calendar_alarm._uri, _calendar_book._uri}) {
        EXPECT_EQ(__qor_calendar_get_record_type(new_record(uri).get()), 2);
    }
    EXPECT_EQ(__qor_calendar_get_record_type(nullptr), 2);
    EXPECT_EQ(__qor_calendar_get_day("P1D", nullptr), 6);
    faults::fail("calendar_record_get_uri_p");
    EXPECT_EQ(__qor_calendar_get_record_type(event.get()), 2);
    EXPECT_EQ(logged(), "");
}

using Operation = std::string (*)(const char* failing_function);

TEST_F(TimeTest, EachFailureIsReportedAndLeavesASafeValue) {
    const Operation make = [](const char* function) {
        faults::fail(function);
        return taken(_qor_calendar_convert_ltos("Asia/Tokyo", 0, false));
    };
    const Operation parse = [](const char* function) {
        faults::fail(function);
        return std::to_string(_qor_calendar_convert_stol("Asia/Tokyo", "20140315T093000"));
    };
    const Operation all_day = [](const char* function) {
        calendar_time_s value = instant(1394875800);
        faults::fail(function);
        const int result = _qor_calendar_set_allday(0, &value);
        return std::to_string(result) + " " + told(value);
    };
    const Operation milliseconds = [](const char* function) {
        calendar_time_s value = date(2000, 1, 1);
        faults::fail(function);
        const int result = _qor_calendar_parse_caltime(0, "1394875800000", &value);
        return std::to_string(result) + " " + told(value);
    };
    const Operation end = [](const char* function) {
        const Record event = new_event(date(2014, 2, 27));
        faults::fail(function);
        const int result = __qor_calendar_get_day("P2D", event.get());
        faults::clear();
        return std::to_string(result) + " " + told_time(event, _calendar_event.end_time);
    };
    const std::string calloc_log = "__qor_calendar_get_ucal: Failed to calloc";
    const std::string open_log =
        "__qor_calendar_get_ucal: ucal_open failed (U_INTERNAL_PROGRAM_ERROR)";
    const std::string no_ucal = ": __qor_calendar_get_ucal() fail";
    const std::string set_log = ": ucal_setMillis failed (U_INTERNAL_PROGRAM_ERROR)";
    const std::string as_utc = " | _qor_calendar_convert_dtol" + no_ucal + ", taken as UTC";
    const std::string start = "0 2014-2-27 0:0:0";
    const struct {
        Operation run;
        const char* function;
        std::string told;
        std::string log;
    } cases[] = {
        {make, "calloc", "(null)", calloc_log + " | _qor_calendar_convert_ltos" + no_ucal},
        {make, "ucal_open", "(null)", open_log + " | _qor_calendar_convert_ltos" + no_ucal},
        {make, "ucal_setMillis", "(null)", "_qor_calendar_convert_ltos" + set_log},
        {make, "ucal_get", "(null)",
         "_qor_calendar_convert_ltos: ucal_get failed (U_INTERNAL_PROGRAM_ERROR)"},
        {make, "strdup", "(null)", ""},
        {parse, "calloc", "1394875800", calloc_log + as_utc},
        {parse, "ucal_open", "1394875800", open_log + as_utc},
        {all_day, "calloc", "0 1394875800", "_qor_calendar_set_allday: Failed to calloc"},
        {all_day, "ucal_open", "-1 1394875800", ""},
        {all_day, "ucal_setMillis", "-1 1394875800", ""},
        {all_day, "ucal_get", "-1 1394875800", ""},
        {milliseconds, "ucal_setMillis", "0 1394875800", ""},
        {end, "calendar_record_get_caltime", "6 0", ""},
        {end, "calendar_record_set_caltime", "0 0", ""},
        {end, "ucal_open", start, open_log + " | __qor_calendar_get_day" + no_ucal},
        {end, "ucal_setDate", start, "__qor_calendar_get_day" + set_log},
        {end, "ucal_add", start, "__qor_calendar_get_day" + set_log},
        {end, "ucal_get", start, "__qor_calendar_get_day" + set_log},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.function);
        EXPECT_EQ(c.run(c.function), c.told);
        EXPECT_EQ(logged(), c.log);
    }
}

}  // namespace
