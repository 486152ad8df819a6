// SPDX-License-Identifier: Apache-2.0
#include <climits>
#include <cstring>

#include "tests/parser_test.h"

namespace {

constexpr struct {
    const char* name;
    int (*parse)(const char* value, calendar_record_h record);
} kHandlers[] = {
    {"freq", __qor_calendar_parse_freq},           {"until", __qor_calendar_parse_until},
    {"count", __qor_calendar_parse_count},         {"interval", __qor_calendar_parse_interval},
    {"wkst", __qor_calendar_parse_wkst},           {"bysecond", __qor_calendar_parse_bysecond},
    {"byminute", __qor_calendar_parse_byminute},   {"byhour", __qor_calendar_parse_byhour},
    {"byday", __qor_calendar_parse_byday},         {"bymonthday", __qor_calendar_parse_bymonthday},
    {"byyearday", __qor_calendar_parse_byyearday}, {"byweekno", __qor_calendar_parse_byweekno},
    {"bymonth", __qor_calendar_parse_bymonth},     {"bysetpos", __qor_calendar_parse_bysetpos},
};

class RuleTest : public ParserTest {
  protected:
    // Every recurrence property that is not at its default, the interval always.
    static std::string recurrence(const Record& event) {
        const auto& view = _calendar_event;
        std::string all = "interval=" + std::to_string(number(event, view.interval));
        const std::tuple<const char*, unsigned int, int> numbers[] = {
            {" freq=", view.freq, 0},
            {" range=", view.range_type, 2},
            {" count=", view.count, 0},
            {" wkst=", view.wkst, 0}};
        for (const auto& [name, property, unset] : numbers) {
            const int value = number(event, property);
            all += value != unset ? name + std::to_string(value) : "";
        }
        const std::string until = told_time(event, view.until_time);
        all += until != "0" ? " until=" + until : "";
        const std::pair<const char*, unsigned int> lists[] = {
            {" bysecond=", view.bysecond},     {" byminute=", view.byminute},
            {" byhour=", view.byhour},         {" byday=", view.byday},
            {" bymonthday=", view.bymonthday}, {" byyearday=", view.byyearday},
            {" byweekno=", view.byweekno},     {" bymonth=", view.bymonth},
            {" bysetpos=", view.bysetpos}};
        for (const auto& [name, property] : lists) {
            const std::string list = text(event, property);
            all += list != "(null)" ? name + list : "";
        }
        return all;
    }

    static Record ruled(const std::string& rule, const calendar_time_s& start = instant(0),
                        const char* zone = nullptr) {
        Record event = new_event(start, zone);
        EXPECT_EQ(_qor_calendar_parse_rrule(rule.c_str(), event.get()), 0) << rule;
        return event;
    }

    static std::string made(const Record& event, int result = 0) {
        char* rule = nullptr;
        EXPECT_EQ(_qor_calendar_make_rrule(event.get(), &rule), result);
        return taken(rule);
    }
};

TEST_F(RuleTest, PartsAreStoredAsTheyCome) {
    const struct {
        const char* rule;
        int result;
        const char* recurrence;
    } cases[] = {
        {"RRULE:FREQ=WEEKLY;BYDAY=MO,WE;UNTIL=20141231T000000Z", 0,
         "interval=1 freq=2 range=0 until=1419984000 byday=MO,WE"},
        {"FREQ=DAILY;COUNT=10;INTERVAL=2", 0, "interval=2 freq=1 range=1 count=10"},
        {"COUNT=3", -1, "interval=7"},
        {"freq=daily", -1, "interval=7"},
        {nullptr, -1, "interval=7"},
        {"FREQ=HOURLY", 0, "interval=1"},
        {"FREQ=YEARLYX;WKST=MONDAY", 0, "interval=1 freq=4 wkst=2"},
        {"FREQ=MONTHLY;WKST=S", 0, "interval=1 freq=3 wkst=-1"},
        {"FREQ=DAILY;COUNT=-5;INTERVAL=abc", 0, "interval=0 freq=1 range=1"},
        {"FREQ=DAILY;COUNT=99999999999;INTERVAL=-3", 0,
         "interval=0 freq=1 range=1 count=2147483647"},
        {"COUNT=5;FREQ=DAILY;UNTIL=20141231", 0,
         "interval=1 freq=1 range=0 count=5 until=1419984000"},
        {"UNTIL=20141231;COUNT=5;FREQ=DAILY", 0,
         "interval=1 freq=1 range=1 count=5 until=1419984000"},
        {";FREQ=DAILY;;BYHOUR=9;", 0, "interval=1 freq=1 byhour=9"},
        {"FREQ=YEARLY;BYMONTH=3;BYMONTHDAY=15", 0, "interval=1 freq=4 bymonthday=15 bymonth=3"},
        {"FREQ=DAILY;BYSECOND=1;BYMINUTE=2;BYYEARDAY=3;BYWEEKNO=4;BYSETPOS=;BYDAY==", 0,
         "interval=1 freq=1 bysecond=1 byminute=2 byday== byyearday=3 byweekno=4 bysetpos="},
        {"X-FREQ=DAILY;interval=3;XBYHOUR=9; BYHOUR=9;BYHOUR", 0, "interval=1"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.rule ? c.rule : "null");
        const Record event = new_event(instant(0), "Etc/GMT");
        EXPECT_EQ(calendar_record_set_int(event.get(), _calendar_event.interval, 7), 0);
        EXPECT_EQ(_qor_calendar_parse_rrule(c.rule, event.get()), c.result);
        EXPECT_EQ(recurrence(event), c.recurrence);
    }
    EXPECT_EQ(logged(), "");
}

TEST_F(RuleTest, APartIsReadWholeOrTheRuleIsRefused) {
    // What is ignored may be of any length.
    EXPECT_EQ(recurrence(ruled("EXDATE=" + std::string(1 << 20, '1') + ";FREQ=DAILY")),
              "interval=1 freq=1");
    // A rule whose every list is as long as can be is written again.
    std::string rule = "FREQ=MONTHLY;INTERVAL=2147483647";
    for (const char* part : {"BYSECOND=", "BYMINUTE=", "BYHOUR=", "BYDAY=", "BYMONTHDAY=",
                             "BYYEARDAY=", "BYWEEKNO=", "BYMONTH=", "BYSETPOS="}) {
        rule += std::string(";") + part + std::string(103 - std::strlen(part), '1');
    }
    rule += ";WKST=SU;UNTIL=20141231T000000Z";
    EXPECT_EQ(made(ruled(rule)), rule);
    EXPECT_EQ(logged(), "");
    for (const size_t length : {104U, 1U << 20}) {
        const std::string part = "BYMONTHDAY=" + std::string(length - 11, '1');
        const Record event = new_event();
        EXPECT_EQ(
            _qor_calendar_parse_rrule(("FREQ=DAILY;" + part + ";COUNT=2").c_str(), event.get()), 6);
        EXPECT_EQ(recurrence(event), "interval=1 freq=1");
        EXPECT_EQ(logged(), "_qor_calendar_parse_rrule: rule part too long [" + part.substr(0, 64) +
                                "] (" + std::to_string(length) + ")");
    }
}

TEST_F(RuleTest, UntilTakesKindAndZoneOfTheStart) {
    const struct {
        calendar_time_s start;
        const char* zone;
        const char* until;
        std::string told;
        const char* error;
    } cases[] = {
        {instant(0), "Etc/GMT", "20141231T000000Z", "1419984000", nullptr},
        {instant(0), nullptr, "20141231", "1419984000", nullptr},
        {instant(0), "Asia/Tokyo", "20141231T000000Z", "1419951600", nullptr},
        {date(2014, 1, 1), "Asia/Tokyo", "20141231", "2014-12-31 0:0:0", nullptr},
        {date(2014, 1, 1), nullptr, "20140231T235959Z", "2014-2-31 0:0:0", nullptr},
        {date(2014, 1, 1), nullptr, "20141331T000000Z", "2014-13-31 0:0:0",
         "[20141331T000000Z]2014/13/31"},
        {date(2014, 1, 1), nullptr, "20140132", "2014-1-32 0:0:0", "[20140132]2014/1/32"},
        {date(2014, 1, 1), nullptr, "20140100", "2014-1-0 0:0:0", "[20140100]2014/1/0"},
        {date(2014, 1, 1), nullptr, "x", "0-0-0 0:0:0", "[x]0/0/0"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.until);
        const Record event = new_event(c.start, c.zone);
        EXPECT_EQ(__qor_calendar_parse_until(c.until, event.get()), 0);
        EXPECT_EQ(told_time(event, _calendar_event.until_time), c.told);
        EXPECT_EQ(number(event, _calendar_event.range_type), 0);
        EXPECT_EQ(logged(), c.error
                                ? std::string("__qor_calendar_parse_until: invalid time:") + c.error
                                : "");
    }
}

// Left: as RFC 5545 3.8.5.3 gives them. Right: as they are written again.
TEST_F(RuleTest, PublishedRulesAreWrittenInOneOrder) {
    const std::pair<std::string, const char*> cases[] = {
        {"FREQ=DAILY;COUNT=10", "FREQ=DAILY;INTERVAL=1;COUNT=10"},
        {"FREQ=DAILY;UNTIL=19971224T000000Z", "FREQ=DAILY;INTERVAL=1;UNTIL=19971224T000000Z"},
        {"FREQ=YEARLY;UNTIL=20000131T140000Z;BYMONTH=1;BYDAY=SU,MO,TU,WE,TH,FR,SA",
         "FREQ=YEARLY;INTERVAL=1;BYDAY=SU,MO,TU,WE,TH,FR,SA;BYMONTH=1;UNTIL=20000131T140000Z"},
        {"FREQ=WEEKLY;INTERVAL=2;UNTIL=19971224T000000Z;WKST=SU;BYDAY=MO,WE,FR",
         "FREQ=WEEKLY;INTERVAL=2;BYDAY=MO,WE,FR;WKST=SU;UNTIL=19971224T000000Z"},
        {"FREQ=MONTHLY;INTERVAL=2;COUNT=10;BYDAY=1SU,-1SU",
         "FREQ=MONTHLY;INTERVAL=2;BYDAY=1SU,-1SU;COUNT=10"},
        {"FREQ=MONTHLY;BYMONTHDAY=-3", "FREQ=MONTHLY;INTERVAL=1;BYMONTHDAY=-3"},
        {"FREQ=YEARLY;INTERVAL=3;COUNT=10;BYYEARDAY=1,100,200",
         "FREQ=YEARLY;INTERVAL=3;BYYEARDAY=1,100,200;COUNT=10"},
        {"FREQ=YEARLY;BYWEEKNO=20;BYDAY=MO", "FREQ=YEARLY;INTERVAL=1;BYDAY=MO;BYWEEKNO=20"},
        {"FREQ=YEARLY;INTERVAL=4;BYMONTH=11;BYDAY=TU;BYMONTHDAY=2,3,4,5,6,7,8",
         "FREQ=YEARLY;INTERVAL=4;BYDAY=TU;BYMONTHDAY=2,3,4,5,6,7,8;BYMONTH=11"},
        {"FREQ=MONTHLY;COUNT=3;BYDAY=TU,WE,TH;BYSETPOS=3",
         "FREQ=MONTHLY;INTERVAL=1;BYDAY=TU,WE,TH;BYSETPOS=3;COUNT=3"},
        {"FREQ=DAILY;BYHOUR=9,10,11,12,13,14,15,16;BYMINUTE=0,20,40",
         "FREQ=DAILY;INTERVAL=1;BYMINUTE=0,20,40;BYHOUR=9,10,11,12,13,14,15,16"},
    };
    for (const auto& [rule, again] : cases) {
        EXPECT_EQ(made(ruled("RRULE:" + rule, instant(0), "Etc/GMT")), again);
        EXPECT_EQ(made(ruled(again)), again);
    }
    for (const std::string day : {"SU", "MO", "TU", "WE", "TH", "FR", "SA"}) {
        const std::string rule = "FREQ=WEEKLY;INTERVAL=2;WKST=" + day;
        EXPECT_EQ(made(ruled(rule)), rule);
    }
    EXPECT_EQ(made(ruled("FREQ=HOURLY;INTERVAL=3"), -1), "(null)");
    EXPECT_EQ(logged(), "");
}

TEST_F(RuleTest, WritingDiffersFromReadingWhereItMust) {
    // Read as time of the zone and written in UTC, it moves at each trip.
    EXPECT_EQ(made(ruled("FREQ=DAILY;UNTIL=20141231T000000Z", instant(0), "Asia/Tokyo")),
              "FREQ=DAILY;INTERVAL=1;UNTIL=20141230T150000Z");
    EXPECT_EQ(made(ruled("FREQ=DAILY;UNTIL=20141231", date(2014, 1, 1))),
              "FREQ=DAILY;INTERVAL=1;UNTIL=20141231T000000Z");
    EXPECT_EQ(made(ruled("WKST=XX;INTERVAL=0;FREQ=DAILY;BYHOUR=")),
              "FREQ=DAILY;INTERVAL=0;BYHOUR=");
    const Record event = ruled("FREQ=DAILY;COUNT=4");
    for (const int range : {2, 3, -1}) {
        EXPECT_EQ(calendar_record_set_int(event.get(), _calendar_event.range_type, range), 0);
        EXPECT_EQ(made(event), "FREQ=DAILY;INTERVAL=1");
    }
    EXPECT_EQ(calendar_record_set_int(event.get(), _calendar_event.freq, 5), 0);
    EXPECT_EQ(made(event, -1), "(null)");
    EXPECT_EQ(logged(), "");
}

TEST_F(RuleTest, ARuleTooLongForItsBufferIsNotWritten) {
    const Record event = ruled("FREQ=DAILY;UNTIL=20141231");
    for (const auto& [until, text] :
         {std::pair{instant(INT64_MAX), "58289631220T000000Z"},
          {date(INT_MAX, INT_MAX, INT_MAX), "214748364721474836472147483647T"}}) {
        EXPECT_EQ(calendar_record_set_caltime(event.get(), _calendar_event.until_time, until), 0);
        EXPECT_EQ(made(event), std::string("FREQ=DAILY;INTERVAL=1;UNTIL=") + text);
    }
    std::string list(
        1023 - std::strlen("FREQ=DAILY;INTERVAL=1;BYDAY=;UNTIL=214748364721474836472147483647T"),
        '1');
    EXPECT_EQ(calendar_record_set_str(event.get(), _calendar_event.byday, list.c_str()), 0);
    EXPECT_EQ(made(event).size(), 1023U);
    for (const std::string& longer : {list + '1', std::string(1 << 20, '1')}) {
        EXPECT_EQ(calendar_record_set_str(event.get(), _calendar_event.byday, longer.c_str()), 0);
        EXPECT_EQ(made(event, 6), "(null)");
        EXPECT_THAT(logged(),
                    ::testing::StartsWith("_qor_calendar_make_rrule: rule too long [FREQ=DAILY;"));
    }
}

TEST_F(RuleTest, AFailureStopsTheReadingAndKeepsWhatWasStored) {
    const std::string failed = "_qor_calendar_parse_rrule: parse fail (6)";
    const std::string set_int = ": set_int() fail (fffffffb) | " + failed;
    const std::string until = "interval=2 freq=1 range=0 count=5 wkst=1 byday=MO";
    const struct {
        const char* function;
        int nth;
        int result;
        std::string recurrence;
        std::string log;
    } cases[] = {
        {"calendar_record_get_uri_p", 1, 4, "interval=7", ""},
        {"calendar_record_get_uri_p", 2, 6, "interval=1",
         "_qor_calendar_parse_rrule: parse fail (4)"},
        {"calendar_record_set_int", 1, 0,
         "interval=2 freq=1 range=0 count=5 wkst=1 until=1419984000 byday=MO", ""},
        {"calendar_record_set_int", 2, 6, "interval=1", "__qor_calendar_parse_freq" + set_int},
        {"calendar_record_set_int", 3, 6, "interval=1 freq=1",
         "__qor_calendar_parse_count" + set_int},
        {"calendar_record_set_int", 4, 6, "interval=1 freq=1 range=1",
         "__qor_calendar_parse_count" + set_int},
        {"calendar_record_set_int", 7, 6, "interval=2 freq=1 range=1 count=5 wkst=1 byday=MO",
         "__qor_calendar_parse_until" + set_int},
        {"calendar_record_get_str_p", 1, 6, until,
         "__qor_calendar_parse_until: get_str_p() fail (fffffffb) | " + failed},
        {"calendar_record_get_caltime", 1, 6, until,
         "__qor_calendar_parse_until: get_caltime() fail (fffffffb) | " + failed},
        {"calendar_record_set_caltime", 1, 6, until,
         "__qor_calendar_parse_until: set_caltime() fail (fffffffb) | " + failed},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.function) + " " + std::to_string(c.nth));
        const Record event = new_event();
        EXPECT_EQ(calendar_record_set_int(event.get(), _calendar_event.interval, 7), 0);
        faults::fail(c.function, c.nth);
        EXPECT_EQ(_qor_calendar_parse_rrule(
                      "FREQ=DAILY;COUNT=5;INTERVAL=2;BYDAY=MO;WKST=SU;UNTIL=20141231", event.get()),
                  c.result);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(recurrence(event), c.recurrence);
        EXPECT_EQ(logged(), c.log);
    }
}

TEST_F(RuleTest, EachHandlerRefusesOtherRecordsAndReportsUnderItsOwnName) {
    const Record todo = new_record(_calendar_todo._uri);
    for (const auto& handler : kHandlers) {
        const Record event = new_event();
        EXPECT_EQ(handler.parse("1", todo.get()), 4);
        EXPECT_EQ(handler.parse(nullptr, event.get()), 4);
        EXPECT_EQ(logged(), "");
        const bool is_list = std::strncmp(handler.name, "by", 2) == 0;
        const std::string setter = is_list ? "set_str" : "set_int";
        faults::fail("calendar_record_" + setter);
        EXPECT_EQ(handler.parse("1", event.get()), 6);
        EXPECT_EQ(recurrence(event), "interval=1");
        EXPECT_EQ(logged(), std::string("__qor_calendar_parse_") + handler.name + ": " + setter +
                                "() fail (fffffffb)");
    }
    EXPECT_EQ(_qor_calendar_parse_rrule("FREQ=DAILY", todo.get()), 4);
    EXPECT_EQ(_qor_calendar_parse_rrule("FREQ=DAILY", nullptr), 4);
    EXPECT_EQ(logged(), "");
    EXPECT_EQ(_qor_calendar_make_rrule(new_event().get(), nullptr), 4);
    EXPECT_EQ(made(todo, 4), "(null)");
    EXPECT_EQ(logged(),
              "_qor_calendar_make_rrule: invalid type. | _qor_calendar_make_rrule: invalid type.");
}

TEST_F(RuleTest, AFailureOfTheWritingLeavesTheOutput) {
    const std::string get_int = "_qor_calendar_make_rrule: get_int() fail (fffffffb)";
    const std::string get_str = "_qor_calendar_make_rrule: get_str_p() fail (fffffffb)";
    const struct {
        const char* range;
        const char* function;
        int nth;
        int result;
        std::string made;
        std::string log;
    } cases[] = {
        {"COUNT=5", "calendar_record_get_int", 1, 6, "(null)", get_int},
        {"COUNT=5", "calendar_record_get_int", 2, 6, "(null)", get_int},
        {"COUNT=5", "calendar_record_get_str_p", 1, 6, "(null)", get_str},
        {"COUNT=5", "calendar_record_get_str_p", 9, 6, "(null)", get_str},
        {"COUNT=5", "calendar_record_get_int", 3, 6, "(null)", get_int},
        {"COUNT=5", "calendar_record_get_int", 4, 6, "(null)", get_int},
        // The range type stands in for a count that cannot be read.
        {"COUNT=5", "calendar_record_get_int", 5, 0, "FREQ=DAILY;INTERVAL=21;COUNT=1", ""},
        {"UNTIL=20141231", "calendar_record_get_caltime", 1, 6, "(null)",
         "_qor_calendar_make_rrule: get_caltime() fail (fffffffb)"},
        // The interval's digits stand in for an until that has no text.
        {"UNTIL=20141231", "ucal_setMillis", 1, 0, "FREQ=DAILY;INTERVAL=21;UNTIL=21",
         "_qor_calendar_convert_ltos: ucal_setMillis failed (U_INTERNAL_PROGRAM_ERROR)"},
        {"COUNT=5", "strdup", 1, 6, "(null)", "_qor_calendar_make_rrule: Failed to strdup"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.function) + " " + std::to_string(c.nth));
        const Record event = ruled(std::string("FREQ=DAILY;INTERVAL=21;") + c.range);
        faults::fail(c.function, c.nth);
        EXPECT_EQ(made(event, c.result), c.made);
        EXPECT_TRUE(faults::fired());
        faults::clear();
        EXPECT_EQ(logged(), c.log);
    }
}

}  // namespace
