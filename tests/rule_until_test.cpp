// SPDX-License-Identifier: Apache-2.0
//
// UNTIL between its two forms, and the order of keys that a device needs.
#include "host/document/rule_until.h"

#include <gtest/gtest.h>

namespace qor {
namespace {

std::string document(const std::string& zone, const std::string& rule, bool all_day = false) {
    return R"({"EVENT":{"dtstart":"1388484000000",)" +
           (all_day ? std::string(R"("allDay":"1",)") : std::string()) + R"("eventTimezone":")" +
           zone + R"(","rrule":")" + rule + R"(","hasAttendeeData":"0"},"REMINDERS":[]})";
}

TEST(RuleUntil, TurnsIntoTheClockOfTheEventsZoneAndBack) {
    const struct {
        const char* name;
        const char* zone;
        const char* utc;
        const char* wall;
    } cases[] = {
        {"winter", "Europe/Berlin", "UNTIL=20141231T225959Z", "UNTIL=20141231T235959"},
        {"summer", "Europe/Berlin", "UNTIL=20140701T080000Z", "UNTIL=20140701T100000"},
        {"over midnight, parts behind it", "Asia/Tokyo",
         "FREQ=DAILY;UNTIL=20141231T200000Z;WKST=MO", "FREQ=DAILY;UNTIL=20150101T050000;WKST=MO"},
        {"west", "America/New_York", "UNTIL=20150101T033000Z", "UNTIL=20141231T223000"},
        {"half hours", "Asia/Kolkata", "UNTIL=20150101T000000Z", "UNTIL=20150101T053000"},
        {"no zone", "", "UNTIL=20141231T235959Z", "UNTIL=20141231T235959"},
        {"second of two hours", "Europe/Berlin", "UNTIL=20141026T013000Z", "UNTIL=20141026T023000"},
        {"after a prefix", "Asia/Tokyo", "RRULE:UNTIL=20141231T000000Z",
         "RRULE:UNTIL=20141231T090000"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        EXPECT_EQ(until_to_wall_clock(document(c.zone, c.utc)), document(c.zone, c.wall));
        EXPECT_EQ(until_to_utc(document(c.zone, c.wall)), document(c.zone, c.utc));
        EXPECT_EQ(until_to_wall_clock(document(c.zone, c.wall)), document(c.zone, c.wall));
        EXPECT_EQ(until_to_utc(document(c.zone, c.utc)), document(c.zone, c.utc));
    }
    // The clock shows 02:30 twice; a device takes the second.
    EXPECT_EQ(until_to_wall_clock(document("Europe/Berlin", "UNTIL=20141026T003000Z")),
              document("Europe/Berlin", "UNTIL=20141026T023000"));
}

TEST(RuleUntil, LeavesAloneWhatItCannotRewrite) {
    const std::string same[] = {
        document("Europe/Berlin", "FREQ=DAILY;COUNT=3"),
        document("Europe/Berlin", "FREQ=DAILY;UNTIL=20141231"),
        document("Europe/Berlin", "FREQ=DAILY;UNTIL="),
        document("Europe/Berlin", "FREQ=DAILY;UNTIL=20141231T2359"),
        document("Europe/Berlin", "FREQ=DAILY;XUNTIL=20141231T225959Z"),
        document("Europe/Berlin", "FREQ=DAILY;UNTIL=20141231T225959ZZ"),
        document("Mars/Olympus", "FREQ=DAILY;UNTIL=20141231T225959Z"),
        document("Europe/Berlin", "FREQ=DAILY;UNTIL=20141231T000000Z", true),
        R"({"EVENT":{"title":"UNTIL=20141231T225959Z"}})",
        R"({"EVENT":"UNTIL="})",
        R"({"EVENT":{"rrule":5,"title":"UNTIL="}})",
        "UNTIL= is no JSON",
        "",
    };
    for (const std::string& text : same) {
        SCOPED_TRACE(text);
        EXPECT_EQ(until_to_wall_clock(text), text);
        EXPECT_EQ(until_to_utc(text), text);
    }
}

TEST(RuleUntil, MovesTheRuleBehindWhatADeviceReadsItWith) {
    EXPECT_EQ(
        until_to_wall_clock(
            R"({"EVENT":{"rrule":"UNTIL=20141231T000000Z","dtstart":"0","eventTimezone":"Asia/Tokyo"}})"),
        R"({"EVENT":{"dtstart":"0","eventTimezone":"Asia/Tokyo","rrule":"UNTIL=20141231T090000"}})");
    EXPECT_EQ(
        until_to_wall_clock(
            R"({"EVENT":{"dtstart":"0","rrule":"UNTIL=20141231T000000Z","allDay":"1","title":"t"}})"),
        R"({"EVENT":{"dtstart":"0","allDay":"1","title":"t","rrule":"UNTIL=20141231T000000Z"}})");
}

}  // namespace
}  // namespace qor
