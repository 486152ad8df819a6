// SPDX-License-Identifier: Apache-2.0
//
// .ics files to documents and back: what each property becomes, odd producers, broken files,
// importing again, and the round trip.
#include "host/ics/ics_import.h"

#include <fmt/format.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "host/cloud/cloud_keys.h"
#include "host/document/event_document.h"
#include "host/ics/ics_export.h"
#include "host/ics/ics_zones.h"

namespace qor {
namespace {

namespace fs = std::filesystem;

constexpr std::int64_t kHour = 3600;
constexpr std::int64_t kDay = 24 * kHour;

std::string calendar(const std::string& body) {
    return "BEGIN:VCALENDAR\nVERSION:2.0\n" + body + "END:VCALENDAR\n";
}

std::string vevent(const std::string& lines, const std::string& uid = "e") {
    return "BEGIN:VEVENT\nUID:" + uid + "\n" + lines + "\nEND:VEVENT\n";
}

class IcsTest : public ::testing::Test {
  protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "qor-ics-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder_ = pattern;
        reset();
    }
    void TearDown() override { fs::remove_all(folder_); }

    void reset() {
        store_.emplace(*CloudStore::open((folder_ / fmt::format("{}.db", ++stores_)).string(),
                                         {.who = "test", .create = true}));
    }
    ImportSummary import(const std::string& text,
                         const ImportOptions& options = {.floating_zone = "Europe/Berlin"}) {
        const std::string file = (folder_ / "file.ics").string();
        std::ofstream(file, std::ios::binary) << text;
        Result<ImportSummary> summary = import_ics(file, &*store_, options);
        EXPECT_TRUE(summary.ok()) << (summary.ok() ? "" : summary.error().message);
        return summary.ok() ? *summary : ImportSummary{};
    }
    std::string text_of(const std::string& key) {
        const auto document = *store_->get(key);
        return document && !document->deleted ? document->text : "";
    }
    EventDocument parsed(const std::string& key = "e") {
        return EventDocument::parse(text_of(key)).value_or(EventDocument{});
    }
    std::map<std::string, std::string> all_texts() {
        std::map<std::string, std::string> texts;
        for (const CloudDocument& document : *store_->documents()) {
            texts[document.key] = document.text;
        }
        return texts;
    }
    std::string exported() {
        std::string text;
        const auto done = export_ics(*store_, [&](std::string_view piece) {
            text += piece;
            return true;
        });
        EXPECT_TRUE(done.ok());
        return text;
    }

    fs::path folder_;
    std::optional<CloudStore> store_;
    int stores_ = 0;
};

TEST_F(IcsTest, AnEventBecomesItsDocument) {
    import(calendar(vevent(
        "SUMMARY:One\\, two\nLOCATION:Room\nDESCRIPTION:a\\nb; folded\n  here\n"
        "DTSTART;TZID=Europe/Berlin:20260105T093000\nDTEND;TZID=Europe/Berlin:20260105T103000\n"
        "RRULE:FREQ=WEEKLY;COUNT=3;BYDAY=MO\nORGANIZER;CN=\"Ann, ^'A.^'\":mailto:a@x.org\n"
        "GEO:37.566535;-0.5\nBEGIN:VALARM\nACTION:DISPLAY\nTRIGGER:-PT15M\nEND:VALARM")));
    EXPECT_EQ(
        text_of("e"),
        R"({"EVENT":{"title":"One, two","eventLocation":"Room","description":"a\nb; folded here",)"
        R"("eventStatus":"0","eventTimezone":"Europe/Berlin","dtstart":"1767601800000",)"
        R"("dtend":"1767605400000","accessLevel":"0","hasAlarm":"1",)"
        R"("rrule":"FREQ=WEEKLY;INTERVAL=1;BYDAY=MO;COUNT=3","hasAttendeeData":"0",)"
        R"("organizer":"Ann, \"A.\"","longitude":"-0500000","latitude":"37566535"},)"
        R"("REMINDERS":[{"method":"1","minutes":"15"}]})");
    import(calendar(vevent("DTSTART;VALUE=DATE:20260105", "d")));
    EXPECT_EQ(text_of("d"), R"({"EVENT":{"eventStatus":"0","allDay":"1","dtstart":"1767571200000",)"
                            R"("dtend":"1767657600000","accessLevel":"0","hasAlarm":"0",)"
                            R"("hasAttendeeData":"0"}})");
}

TEST_F(IcsTest, TimesAreReadAsTheirProducersMeanThem) {
    const struct {
        const char* name;
        const char* lines;
        std::int64_t start_s;
        std::int64_t length_s;
        const char* zone;  // null: an all-day event
    } cases[] = {
        {"UTC", "DTSTART:20260105T083000Z\nDTEND:20260105T093000Z", 1767601800, 3600, "Etc/GMT"},
        {"floating", "DTSTART:20260105T093000", 1767601800, 0, "Europe/Berlin"},
        {"days of a duration follow the clock",
         "DTSTART;TZID=Europe/Berlin:20260328T120000\nDURATION:P1DT1H", 1774695600, kDay,
         "Europe/Berlin"},
        {"weeks", "DTSTART:20260105T083000Z\nDURATION:P1W", 1767601800, 604800, "Etc/GMT"},
        {"two zones",
         "DTSTART;TZID=Europe/Berlin:20260105T120000\nDTEND;TZID=America/New_York:20260105T120000",
         1767610800, 6 * kHour, "Europe/Berlin"},
        {"a time that is skipped", "DTSTART;TZID=Europe/Berlin:20260329T023000", 1774747800, 0,
         "Europe/Berlin"},
        {"a time that comes twice", "DTSTART;TZID=Europe/Berlin:20261025T023000", 1792888200, 0,
         "Europe/Berlin"},
        {"end before start", "DTSTART:20260105T083000Z\nDTEND:20260105T073000Z", 1767601800, 0,
         "Etc/GMT"},
        {"long ago", "DTSTART;VALUE=DATE:16040229", -11544768000, 86400, nullptr},
        {"days", "DTSTART;VALUE=DATE:20260105\nDTEND;VALUE=DATE:20260108", 1767571200, 3 * kDay,
         nullptr},
        {"a day that ends when it starts", "DTSTART;VALUE=DATE:20260105\nDTEND;VALUE=DATE:20260105",
         1767571200, 86400, nullptr},
        {"a day's duration", "DTSTART;VALUE=DATE:20260105\nDURATION:P2D", 1767571200, 2 * kDay,
         nullptr},
        {"a day in hours", "DTSTART;VALUE=DATE:20260105\nDURATION:PT24H", 1767571200, 86400,
         nullptr},
        {"a date that does not say so", "DTSTART:20260105", 1767571200, 86400, nullptr},
        {"midnights with a marker",
         "DTSTART;TZID=Europe/Berlin:20260105T000000\nDTEND;TZID=Europe/Berlin:20260106T000000\n"
         "X-MICROSOFT-CDO-ALLDAYEVENT:TRUE",
         1767571200, 86400, nullptr},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        reset();
        import(calendar(vevent(c.lines)));
        const EventDocument document = parsed();
        EXPECT_EQ(document.start_ms, c.start_s * 1000);
        EXPECT_EQ(document.end_ms.value_or(0) - document.start_ms.value_or(0), c.length_s * 1000);
        EXPECT_EQ(document.all_day, c.zone == nullptr);
        EXPECT_EQ(document.zone.value_or("-"), c.zone == nullptr ? "-" : c.zone);
    }
}

TEST_F(IcsTest, RulesTakeTheFormThatDevicesWrite) {
    const std::string berlin = "DTSTART;TZID=Europe/Berlin:20260105T093000\n";
    const std::string day = "DTSTART;VALUE=DATE:20260105\n";
    const struct {
        const char* name;
        std::string lines;
        const char* rule;
    } cases[] = {
        {"order", berlin + "RRULE:WKST=SU;INTERVAL=2;BYDAY=+1MO,-1FR;FREQ=MONTHLY",
         "FREQ=MONTHLY;INTERVAL=2;BYDAY=1MO,-1FR;WKST=SU"},
        {"until in UTC", berlin + "RRULE:FREQ=DAILY;UNTIL=20260701T073000Z",
         "FREQ=DAILY;INTERVAL=1;UNTIL=20260701T073000Z"},
        {"until without a zone", berlin + "RRULE:FREQ=DAILY;UNTIL=20260701T093000",
         "FREQ=DAILY;INTERVAL=1;UNTIL=20260701T073000Z"},
        {"until a date takes in that day", berlin + "RRULE:FREQ=DAILY;UNTIL=20260701",
         "FREQ=DAILY;INTERVAL=1;UNTIL=20260701T215959Z"},
        {"a day's until", day + "RRULE:FREQ=DAILY;UNTIL=20260701",
         "FREQ=DAILY;INTERVAL=1;UNTIL=20260701T000000Z"},
        {"a day's until as a time", day + "RRULE:FREQ=DAILY;UNTIL=20260701T215959Z",
         "FREQ=DAILY;INTERVAL=1;UNTIL=20260701T000000Z"},
        {"hourly stays", berlin + "RRULE:FREQ=HOURLY", "FREQ=HOURLY;INTERVAL=1"},
        {"all parts", day + "RRULE:FREQ=YEARLY;BYMONTH=1,2;BYSETPOS=-1;BYMONTHDAY=-1;BYHOUR=9",
         "FREQ=YEARLY;INTERVAL=1;BYHOUR=9;BYMONTHDAY=-1;BYMONTH=1,2;BYSETPOS=-1"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        reset();
        import(calendar(vevent(c.lines)));
        EXPECT_EQ(parsed().rule.value_or("-"), c.rule);
    }
}

TEST_F(IcsTest, AlarmsCountMinutesBeforeTheStart) {
    const struct {
        const char* trigger;
        std::vector<std::int64_t> minutes;
    } cases[] = {
        {"TRIGGER:-PT15M", {15}},
        {"TRIGGER:PT15M", {-15}},
        {"TRIGGER:PT0S", {0}},
        {"TRIGGER:-P1DT1H", {1500}},
        {"TRIGGER:-P1W", {10080}},
        {"TRIGGER;RELATED=END:-PT10M", {-50}},
        {"TRIGGER;VALUE=DATE-TIME:20260105T080000Z", {}},
        {"TRIGGER:-PT5M\nEND:VALARM\nBEGIN:VALARM\nACTION:AUDIO\nTRIGGER:-PT90S", {5, 1}},
        {"DESCRIPTION:none", {}},
        {"TRIGGER:-PT10M\nX-OWN:1\nEND:VALARM\nBEGIN:VALARM\nTRIGGER:-PT5M\nACTION:NONE", {10}},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.trigger);
        reset();
        import(calendar(vevent(std::string("DTSTART:20260105T083000Z\nDURATION:PT1H\nBEGIN:VALARM\n"
                                           "ACTION:DISPLAY\n") +
                               c.trigger + "\nEND:VALARM")));
        EXPECT_EQ(parsed().reminders, c.minutes);
    }
}

// Rules of a VTIMEZONE whose clocks change like Berlin's.
const std::string kBerlinRules =
    "BEGIN:DAYLIGHT\nDTSTART:19810329T020000\nRRULE:FREQ=YEARLY;BYMONTH=3;BYDAY=-1SU\n"
    "TZOFFSETFROM:+0100\nTZOFFSETTO:+0200\nEND:DAYLIGHT\nBEGIN:STANDARD\nDTSTART:19961027T030000\n"
    "RRULE:FREQ=YEARLY;BYMONTH=10;BYDAY=-1SU\nTZOFFSETFROM:+0200\nTZOFFSETTO:+0100\nEND:STANDARD\n";

std::string vtimezone(const std::string& id, const std::string& rules) {
    return "BEGIN:VTIMEZONE\nTZID:" + id + "\n" + rules + "END:VTIMEZONE\n";
}

TEST_F(IcsTest, ZonesAreKnownByManyNames) {
    const std::string odd_rules =
        "BEGIN:STANDARD\nDTSTART:19700101T000000\nTZOFFSETFROM:+0117\nTZOFFSETTO:+0117\n"
        "END:STANDARD\n";
    const struct {
        const char* tzid;
        std::string zone_component;
        const char* zone;
        int offset_minutes;
        bool told;  // not by its own name: the report says what was made of it
    } cases[] = {
        {"Europe/Paris", "", "Europe/Paris", 120, false},
        {"UTC", "", "Etc/GMT", 0, false},
        {"/example.org/20210210_1/America/Argentina/Buenos_Aires", "",
         "America/Argentina/Buenos_Aires", -180, true},
        {"Tokyo Standard Time", "", "Asia/Tokyo", 540, true},
        {"America-Chicago", "", "America/Chicago", -300, true},
        {"My zone", vtimezone("My zone", "X-LIC-LOCATION:Asia/Kolkata\n" + odd_rules),
         "Asia/Kolkata", 330, true},
        {"(UTC+01:00) Mitte", vtimezone("(UTC+01:00) Mitte", kBerlinRules), nullptr, 120, true},
        {"Nowhere", vtimezone("Nowhere", odd_rules), "Etc/GMT", 77, true},
        {"Unheard of", "", "America/New_York", -240, true},
        {"Europe/Paris", vtimezone("Europe/Paris", odd_rules), "Europe/Paris", 120, false},
        {"Broken", "BEGIN:VTIMEZONE\nEND:VTIMEZONE\n", "America/New_York", -240, true},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.tzid);
        reset();
        // The VTIMEZONE may stand behind what uses it.
        const ImportSummary summary =
            import(calendar(vevent(fmt::format("DTSTART;TZID=\"{}\":20260701T120000", c.tzid)) +
                            c.zone_component),
                   {.floating_zone = "America/New_York"});
        const EventDocument document = parsed();
        EXPECT_EQ(document.start_ms, (1782907200 - c.offset_minutes * 60) * 1000LL);
        EXPECT_EQ(summary.report.zones.contains(c.tzid), c.told);
        if (c.zone != nullptr) {
            EXPECT_EQ(document.zone, c.zone);
        } else {  // some zone with these rules, in winter too
            const WallTime winter{2026, 1, 1, 12, 0, 0};
            EXPECT_EQ(instant_of(winter, document.zone.value_or("")),
                      instant_of(winter, "Europe/Berlin"));
        }
    }
}

TEST_F(IcsTest, OfZonesThatOnceWentAlikeTheOneThatKeptItsRulesIsTaken) {
    const auto rules = [](const char* winter, const char* summer, const char* spring_dates,
                          const char* autumn_dates) {
        return fmt::format(
            "BEGIN:DAYLIGHT\nDTSTART:19870405T020000\nTZOFFSETFROM:{0}\nTZOFFSETTO:{1}\n{2}\n"
            "END:DAYLIGHT\nBEGIN:STANDARD\nDTSTART:19871025T020000\nTZOFFSETFROM:{1}\n"
            "TZOFFSETTO:{0}\n{3}\nEND:STANDARD\n",
            winter, summer, spring_dates, autumn_dates);
    };
    const struct {
        std::string rules;
        const char* zone;  // not Whitehorse or Mexico City, which gave up changing their clocks
    } cases[] = {
        {rules("-0800", "-0700", "RRULE:FREQ=YEARLY;BYMONTH=4;BYDAY=1SU",
               "RRULE:FREQ=YEARLY;BYMONTH=10;BYDAY=-1SU"),
         "America/Los_Angeles"},
        {rules("-0600", "-0500", "RDATE:19970406T020000,19980405T020000,19990404T020000",
               "RDATE:19971026T020000,19981025T020000,19991031T020000"),
         "America/Chicago"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.zone);
        reset();
        import(calendar(vtimezone("Mine", c.rules) + vevent("DTSTART;TZID=Mine:19970701T120000")));
        EXPECT_EQ(parsed().zone, c.zone);
    }
}

TEST_F(IcsTest, FloatingTimesTakeTheCalendarsZone) {
    import("BEGIN:VCALENDAR\nX-WR-TIMEZONE:Asia/Tokyo\n" + vevent("DTSTART:20260105T090000") +
               "END:VCALENDAR\n",
           {});
    EXPECT_EQ(parsed().zone, "Asia/Tokyo");
    EXPECT_EQ(parsed().start_ms, 1767571200000);
}

const char* const kSeries =
    "SUMMARY:Choir\nDTSTART;TZID=Europe/Berlin:20260105T193000\nDURATION:PT2H\nRRULE:FREQ=WEEKLY";

TEST_F(IcsTest, OccurrencesNameTheirEventAndInstant) {
    const ImportSummary summary =
        import(calendar(vevent("RECURRENCE-ID;TZID=Europe/Berlin:20260112T193000\nSUMMARY:Late\n"
                               "DTSTART;TZID=Europe/Berlin:20260112T203000") +
                        vevent(std::string(kSeries) +
                               "\nEXDATE;TZID=Europe/Berlin:20260119T193000,20260126T193000\n"
                               "EXDATE:20260202T183000Z\nEXDATE;VALUE=DATE:20260209\n"
                               "EXDATE;TZID=Europe/Berlin:20260112T193000") +
                        vevent("RECURRENCE-ID:20260216T183000Z\nSTATUS:CANCELLED") +
                        vevent("RECURRENCE-ID:20260223T183000Z\nDTSTART;VALUE=DATE:20260223")));
    EXPECT_EQ(summary.events, 1U);
    EXPECT_EQ(summary.changed_occurrences, 2U);
    EXPECT_EQ(summary.cancelled_occurrences, 5U);
    EXPECT_EQ(text_of("e#20260112T183000Z"),
              R"({"EVENT":{"title":"Late","eventStatus":"0","eventTimezone":"Europe/Berlin",)"
              R"("dtstart":"1768246200000","dtend":"1768246200000","accessLevel":"0",)"
              R"("hasAlarm":"0","original_sync_id":"e","originalInstanceTime":"1768242600000",)"
              R"("hasAttendeeData":"0"}})");
    for (const char* instant : {"20260119", "20260126", "20260202", "20260209", "20260216"}) {
        EXPECT_TRUE(parsed(fmt::format("e#{}T183000Z", instant)).cancelled) << instant;
    }
    EXPECT_EQ(text_of("e#20260119T183000Z"),
              R"({"EVENT":{"eventStatus":"2","dtstart":"1768847400000","original_sync_id":"e",)"
              R"("originalInstanceTime":"1768847400000"}})");
    // The instance of a timed event is no date, so "allDay" follows it.
    EXPECT_EQ(text_of("e#20260223T183000Z"),
              R"({"EVENT":{"eventStatus":"0","dtstart":"1771804800000","dtend":"1771891200000",)"
              R"("accessLevel":"0","hasAlarm":"0","original_sync_id":"e",)"
              R"("originalInstanceTime":"1771871400000","allDay":"1","hasAttendeeData":"0"}})");
    // Events come before their occurrences, so that a reader of the change feed meets them first.
    EXPECT_EQ(store_->documents()->front().key, "e");
}

TEST_F(IcsTest, OccurrencesOfAllDayEventsAreDates) {
    import(calendar(vevent("DTSTART;VALUE=DATE:20260105\nRRULE:FREQ=WEEKLY\n"
                           "EXDATE;VALUE=DATE:20260112\nEXDATE;TZID=Asia/Tokyo:20260119T000000") +
                    vevent("RECURRENCE-ID;VALUE=DATE:20260126\nDTSTART;VALUE=DATE:20260127")));
    for (const char* instant : {"20260112", "20260119", "20260126"}) {
        const EventDocument occurrence = parsed(fmt::format("e#{}T000000Z", instant));
        EXPECT_TRUE(occurrence.is_occurrence()) << instant;
        EXPECT_TRUE(occurrence.instance_is_date) << instant;
    }
    EXPECT_EQ(text_of("e#20260112T000000Z"),
              R"({"EVENT":{"eventStatus":"2","allDay":"1","dtstart":"1768176000000",)"
              R"("original_sync_id":"e","originalInstanceTime":"1768176000000"}})");
}

TEST_F(IcsTest, OccurrencesFindTheirEventInTheCloudOrStandAlone) {
    const std::string later =
        calendar(vevent("RECURRENCE-ID;VALUE=DATE:20260112\nSUMMARY:Late\n"
                        "DTSTART;TZID=Europe/Berlin:20260112T203000"));
    ImportSummary summary = import(later);
    EXPECT_EQ(summary.report.not_carried.size(), 1U);
    EXPECT_FALSE(parsed("e#20260112T000000Z").is_occurrence());
    reset();
    // Some producers give a whole series a RECURRENCE-ID.
    import(calendar(vevent(std::string(kSeries) + "\nRECURRENCE-ID:19700101T000000Z\n"
                                                  "EXDATE;TZID=Europe/Berlin:20260112T193000")));
    EXPECT_TRUE(parsed("e#19700101T000000Z").rule);
    EXPECT_TRUE(parsed("e#19700101T000000Z#20260112T183000Z").cancelled);
    reset();
    import(calendar(vevent(kSeries)));
    summary = import(later);
    EXPECT_TRUE(summary.report.not_carried.empty());
    EXPECT_EQ(parsed("e#20260112T183000Z").parent_key, "e");
}

TEST_F(IcsTest, UidsThatAreMissingOrSharedLoseNoEvent) {
    const std::string file =
        calendar(vevent("SUMMARY:A\nDTSTART:20260105T083000Z") +
                 vevent("SUMMARY:B\nDTSTART:20260105T083000Z") +
                 vevent("SUMMARY:B\nDTSTART:20260105T083000Z") +
                 vevent("SUMMARY:Old\nDTSTART:20260105T083000Z", "v") +
                 vevent("SUMMARY:New\nSEQUENCE:1\nDTSTART:20260105T083000Z", "v") +
                 "BEGIN:VEVENT\nSUMMARY:C\nDTSTART:20260105T083000Z\nEND:VEVENT\n" +
                 vevent("SUMMARY:D\nDTSTART:20260105T083000Z", "it's \"odd\""));
    EXPECT_EQ(import(file).added, 5U);
    EXPECT_EQ(parsed("e").title, "A");
    EXPECT_EQ(parsed("v").title, "New");
    EXPECT_EQ(import(file).unchanged, 5U);
    EXPECT_EQ(store_->documents()->size(), 5U);
}

TEST_F(IcsTest, WhatDocumentsCannotCarryIsCountedByKind) {
    const std::string start = "DTSTART:20260105T083000Z\n";
    const struct {
        std::string body;
        const char* kind;
    } cases[] = {
        {vevent(start + "ATTENDEE:mailto:a@x.org"), "ATTENDEE"},
        {vevent(start + "RDATE:20260106T083000Z"), "RDATE"},
        {vevent(start + "URL:https://x.org"), "URL"},
        {vevent(start + "CLASS:PRIVATE"), "CLASS:PRIVATE"},
        {vevent(start + "STATUS:TENTATIVE"), "STATUS:TENTATIVE"},
        {vevent(start + "STATUS:CANCELLED"), "event with STATUS:CANCELLED (left out)"},
        {vevent(start + "SUMMARY;LANGUAGE=en:a"), "SUMMARY;LANGUAGE"},
        {vevent(start + "X-OWN:1"), "X-OWN"},
        {vevent(start + "UNHEARD-OF:1"), "UNHEARD-OF"},
        {vevent(start + "GEO:91;0"), "GEO out of range"},
        {vevent(start + "EXDATE:20260106T083000Z"), "EXDATE of an event without RRULE"},
        {vevent(start + "RRULE:FREQ=DAILY\nRRULE:FREQ=WEEKLY"), "RRULE, a second one"},
        {vevent(start + "RRULE:FREQ=HOURLY"), "RRULE with FREQ=HOURLY (devices show it once)"},
        {vevent(start + "RRULE:FREQ=YEARLY;BYYEARDAY=100,110,120,130,140,150,160,170,180,190,200,"
                        "210,220,230,240,250,260,270,280,290,300,310,320,330"),
         "RRULE with BYYEARDAY longer than 103 characters (devices cannot read it)"},
        {vevent(start + "BEGIN:VALARM\nACTION:DISPLAY\nTRIGGER;VALUE=DATE-TIME:20260105T080000Z\n"
                        "END:VALARM"),
         "VALARM at a fixed time"},
        {vevent(start + "BEGIN:VALARM\nACTION:DISPLAY\nTRIGGER:-PT5M\nREPEAT:2\nEND:VALARM"),
         "VALARM REPEAT"},
        {vevent(start + "BEGIN:VALARM\nACTION:NONE\nTRIGGER:-PT5M\nEND:VALARM"),
         "VALARM with ACTION:NONE (no alert)"},
        {vevent(start + "DTSTAMP;VALUE=DATE:20260105"), "DTSTAMP;VALUE"},
        {vevent(start + "LOCATION;VALUE=URI:https://x.org"), "LOCATION;VALUE"},
        {vevent(start + "RDATE;VALUE=PERIOD:x"), "RDATE"},
        {vevent("SUMMARY:a\n" + start, "a uid"),
         "UID with characters that no key can have (a digest takes its place)"},
        {vevent(start + "BEGIN:PARTICIPANT\nUID:x\nEND:PARTICIPANT"),
         "component of an unknown kind inside an event"},
        {"BEGIN:VTODO\nUID:t\nEND:VTODO\n", "VTODO"},
        {"BEGIN:VJOURNAL\nUID:t\nEND:VJOURNAL\n", "VJOURNAL"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.kind);
        reset();
        const ImportSummary summary = import(calendar(c.body));
        ASSERT_EQ(summary.report.not_carried.size(), 1U);
        EXPECT_EQ(summary.report.not_carried.begin()->first, c.kind);
        EXPECT_EQ(summary.report.not_carried.begin()->second.count, 1U);
        EXPECT_TRUE(summary.report.problems.empty());
    }
}

TEST_F(IcsTest, OneBadEventNeverStopsTheRest) {
    const std::string start = "SUMMARY:Bad\nDTSTART:20260105T083000Z\n";
    const struct {
        const char* name;
        std::string body;
        bool stored;  // as far as it goes
    } cases[] = {
        {"no start", vevent("SUMMARY:Bad", "bad"), false},
        {"a start that is none", vevent("SUMMARY:Bad\nDTSTART:tomorrow", "bad"), false},
        {"a 31st of February", vevent("DTSTART;VALUE=DATE:20260231", "bad"), false},
        {"no end of it", "BEGIN:VEVENT\nUID:bad\n" + start, false},
        {"no end of its alarm", "BEGIN:VEVENT\nUID:bad\n" + start + "BEGIN:VALARM\nEND:VEVENT\n",
         false},
        {"a rule that is none", vevent(start + "RRULE:FREQ=SOMETIMES", "bad"), true},
        {"a line that is none", vevent(start + "just text", "bad"), true},
        {"an exception that is none", vevent(start + "EXDATE:never", "bad"), true},
        {"an end before its start", vevent(start + "DTEND:20250105T083000Z", "bad"), true},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        reset();
        const ImportSummary summary =
            import(calendar(vevent(start, "before") + c.body + vevent(start, "after")));
        EXPECT_FALSE(text_of("before").empty());
        EXPECT_FALSE(text_of("after").empty());
        EXPECT_EQ(!text_of("bad").empty(), c.stored);
        ASSERT_EQ(summary.report.problems.size(), 1U);
        EXPECT_NE(summary.report.problems[0].where.find("file.ics:9"), std::string::npos)
            << summary.report.problems[0].where;
    }
}

TEST_F(IcsTest, FilesComeInManyForms) {
    const std::string plain =
        calendar(vevent("SUMMARY:Caf\xc3\xa9 \xe2\x98\x95 fo\n lded\nDTSTART:20260105T083000Z"));
    const auto with = [&](const std::string& from, const std::string& to) {
        std::string text = plain;
        for (std::size_t at = 0; (at = text.find(from, at)) != std::string::npos; at += to.size()) {
            text.replace(at, from.size(), to);
        }
        return text;
    };
    const std::string expected = "Caf\xc3\xa9 \xe2\x98\x95 folded";
    const struct {
        const char* name;
        std::string text;
        std::string title;
    } cases[] = {
        {"LF", plain, expected},
        {"CRLF", with("\n", "\r\n"), expected},
        {"CR", with("\n", "\r"), expected},
        {"byte order mark", "\xef\xbb\xbf" + plain, expected},
        {"folded inside a character", with("\xc3\xa9", "\xc3\n \xa9"), expected},
        {"folded with a tab", with("\n lded", "\n\tlded"), expected},
        {"lower case", with("BEGIN:VEVENT", "begin:vevent"), expected},
        {"no calendar around it", vevent("SUMMARY:x\nDTSTART:20260105T083000Z"), "x"},
        {"no end of the calendar", with("END:VCALENDAR\n", ""), expected},
        {"two calendars", plain + calendar(vevent("DTSTART:20260105T083000Z", "f")), expected},
        {"ISO 8859-1", with("\xc3\xa9 \xe2\x98\x95", "\xe9"), "Caf\xc3\xa9 folded"},
        {"control characters",
         with("Caf",
              "C\x01"
              "a\rf\x7f"),
         expected},
        {"a NUL", with("Caf", std::string("C\0af", 4)), expected},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        reset();
        import(c.text);
        EXPECT_EQ(parsed().title.value_or("-"), c.title);
    }
    EXPECT_FALSE(cut_ics(std::string("\xff\xfe") + "B", "f").ok());
    EXPECT_FALSE(cut_ics("no calendar at all\n", "f").ok());
    EXPECT_FALSE(cut_ics("", "f").ok());
    EXPECT_FALSE(import_ics((folder_ / "missing.ics").string(), &*store_, {}).ok());
}

TEST_F(IcsTest, ImportingAgainChangesOnlyWhatIsNewInTheFile) {
    const auto file = [](const std::string& title) {
        return calendar(vevent("SUMMARY:" + title +
                               "\nDTSTART:20260105T083000Z\nRRULE:FREQ=DAILY\n"
                               "EXDATE:20260106T083000Z"));
    };
    EXPECT_EQ(import(file("1")).added, 2U);
    const std::int64_t revision = *store_->revision();
    EXPECT_EQ(import(file("1")).unchanged, 2U);
    EXPECT_EQ(*store_->revision(), revision);
    EXPECT_EQ(import(file("2")).changed, 1U);

    // A device edits it; the same file again does not undo that, a newer one is a conflict.
    std::string edited = text_of("e");
    edited.replace(edited.find(R"("2")"), 3, R"("edited")");
    ASSERT_TRUE(store_->write(CloudWrite{"e", edited, false, {}, ""}).ok());
    ImportSummary summary = import(file("2"));
    EXPECT_EQ(summary.kept, 1U);
    EXPECT_TRUE(summary.report.problems.empty());
    summary = import(file("3"));
    EXPECT_EQ(summary.kept, 1U);
    EXPECT_EQ(summary.report.problems.size(), 1U);
    EXPECT_EQ(parsed().title, "edited");

    ASSERT_TRUE(store_->write(CloudWrite{"e", "", true, {}, ""}).ok());
    EXPECT_EQ(import(file("2")).kept, 1U);
    EXPECT_EQ(text_of("e"), "");
    ImportOptions options{.overwrite = true, .dry_run = true};
    EXPECT_EQ(import(file("3"), options).added, 1U);
    EXPECT_EQ(text_of("e"), "");
    options.dry_run = false;
    EXPECT_EQ(import(file("3"), options).added, 1U);
    EXPECT_EQ(parsed().title, "3");
}

TEST_F(IcsTest, ADevicesWordingOfTheSameEventIsNoChange) {
    const std::string file =
        calendar(vevent("SUMMARY:t\nDTSTART;VALUE=DATE:20260105\nRRULE:FREQ=DAILY;UNTIL=20260110\n"
                        "EXDATE;VALUE=DATE:20260106"));
    const CloudWrite as_devices_write[] = {
        {"e",
         R"({"EVENT":{"title":"t","eventStatus":"0","dtstart":"1767571200000","dtend":"1767657600000",)"
         R"("allDay":"1","accessLevel":"0","hasAlarm":"0",)"
         R"("rrule":"FREQ=DAILY;INTERVAL=1;WKST=MO;UNTIL=20260110T000000Z","hasAttendeeData":"0"}})",
         false,
         {},
         ""},
        {"e#20260106T000000Z",
         R"({"EVENT":{"title":"t","dtstart":"1767571200000","dtend":"1767657600000","allDay":"1",)"
         R"("accessLevel":"0","hasAlarm":"0","original_sync_id":"e",)"
         R"("originalInstanceTime":"1767657600000","eventStatus":"2","hasAttendeeData":"0"}})",
         false,
         {},
         ""}};
    for (const CloudWrite& write : as_devices_write) {
        ASSERT_TRUE(store_->write(write).ok());
    }
    EXPECT_EQ(import(file).unchanged, 2U);
    EXPECT_EQ(import(exported()).unchanged, 2U);
}

TEST_F(IcsTest, TheRoundTripIsAFixedPoint) {
    // In a form that an export keeps to the letter, so that libical must understand it alike.
    const std::string zone = vtimezone("Europe/Berlin", kBerlinRules);
    const std::string file = calendar(
        zone +
        vevent(
            "SUMMARY:Long " + std::string(200, 'x') +
            " \xe5\xbc\x95\\; end\n"
            "DESCRIPTION:a\\nb\\, c\nLOCATION:here\nGEO:0.5;-120.25\nORGANIZER:mailto:a@x.org\n"
            "DTSTART;TZID=Europe/Berlin:20260105T193000\nDTEND;TZID=Europe/Berlin:20260105T203000\n"
            "RRULE:FREQ=WEEKLY;UNTIL=20261231T183000Z;INTERVAL=2;BYDAY=MO,WE\n"
            "EXDATE;TZID=Europe/Berlin:20260119T193000\nEXDATE;TZID=Europe/Berlin:20260706T193000\n"
            "BEGIN:VALARM\nACTION:DISPLAY\nTRIGGER:-PT15M\nDESCRIPTION:Reminder\nEND:VALARM\n"
            "BEGIN:VALARM\nACTION:DISPLAY\nTRIGGER:PT1H\nDESCRIPTION:Reminder\nEND:VALARM") +
        vevent("RECURRENCE-ID;TZID=Europe/Berlin:20260202T193000\nSUMMARY:Moved\n"
               "DTSTART;TZID=Europe/Berlin:20260203T193000\nDTEND;TZID=Europe/"
               "Berlin:20260203T203000") +
        vevent("SUMMARY:Days\nDTSTART;VALUE=DATE:20260105\nDTEND;VALUE=DATE:20260107\n"
               "RRULE:FREQ=YEARLY;UNTIL=20300105\nEXDATE;VALUE=DATE:20270105",
               "days") +
        vevent("SUMMARY:UTC\nDTSTART:20261025T013000Z\nDTEND:20261025T023000Z", "utc"));
    const ImportSummary summary = import(file);
    EXPECT_TRUE(summary.report.not_carried.empty()) << summary.report.not_carried.begin()->first;
    const std::string first = exported();
    std::ofstream(folder_ / "first.ics", std::ios::binary) << first;
    EXPECT_EQ(std::system(fmt::format("cd '{}' && '{}/compare_ics' first.ics file.ics",
                                      folder_.string(), QOR_BIN_DIR)
                              .c_str()),
              0);
    const auto texts = all_texts();
    EXPECT_EQ(import(first).unchanged, texts.size());
    reset();
    import(first);
    EXPECT_EQ(all_texts(), texts);
}

TEST_F(IcsTest, WhatAFileCannotSayPlainlySurvivesTheRoundTrip) {
    const char* const documents[] = {
        // The second of two hours of the same name, a zone without rules, zones of all-day events.
        R"("eventTimezone":"Europe/Berlin","dtstart":"1792891800000","dtend":"1792895400000")",
        R"("eventTimezone":"UTC","dtstart":"1792891800000","dtend":"1792895400000")",
        R"("dtstart":"1792891800000","dtend":"1792895400000")",
        R"("eventTimezone":"Mars/Olympus","dtstart":"1792891800000","dtend":"1792895400000")",
        R"("allDay":"1","eventTimezone":"Asia/Tokyo","dtstart":"1767571200000","dtend":"1767657600000")",
        R"("title":" \"quoted\" ; , \\\u0001 \t","dtstart":"0","dtend":"1000","organizer":"Ann: & Co; x")",
        R"("dtstart":"0","dtend":"1000","organizer":"\"Ann\" ^n \\\\ ^\n\t'B'")",
        R"("dtstart":"0","dtend":"1000","longitude":"-0500000","latitude":"-90000000")",
    };
    std::vector<CloudWrite> writes;
    for (const char* document : documents) {
        writes.push_back({fmt::format("k{}", writes.size()),
                          fmt::format(R"({{"EVENT":{{{}}}}})", document),
                          false,
                          {},
                          ""});
    }
    ASSERT_TRUE(store_->write(writes).ok());
    EXPECT_EQ(import(exported()).unchanged, std::size(documents));
}

TEST_F(IcsTest, TheExampleCalendarsComeBackAsTheyWere) {
    for (const auto& entry : fs::directory_iterator(fs::path(QOR_SOURCE_DIR) / "examples")) {
        SCOPED_TRACE(entry.path());
        const auto summary = import_ics(entry.path().string(), &*store_, {});
        ASSERT_TRUE(summary.ok());
        EXPECT_TRUE(summary->report.problems.empty());
    }
    const auto texts = all_texts();
    EXPECT_GE(texts.size(), 60U);
    const std::string first = exported();
    reset();
    import(first);
    EXPECT_EQ(all_texts(), texts);
    const IcalComponent file(icalparser_parse_string(first.c_str()));
    EXPECT_EQ(icalcomponent_count_errors(file.get()), 0);
}

}  // namespace
}  // namespace qor
