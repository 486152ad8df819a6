// SPDX-License-Identifier: Apache-2.0
//
// Devices kept the same through a cloud: what users of such tools complain about, one test each.
#include <gmock/gmock.h>

#include <cstdlib>
#include <ctime>
#include <nlohmann/json.hpp>

#include "host/sync/engine.h"
#include "tests/host_bed.h"
#include "tests/support/compiled_locale.h"

namespace bed {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

constexpr long long kMonday = 1767625200;  // 2026-01-05 15:00 UTC
constexpr long long kDay = 86400;

NewEvent weekly(const std::string& title) {
    NewEvent event;
    event.title = title;
    event.frequency = CALENDAR_RECURRENCE_WEEKLY;
    event.count = 10;
    return event;
}

std::string simple(const std::string& title) {
    return document({{"title", title},
                     {"dtstart", "1767625200000"},
                     {"dtend", "1767628800000"},
                     {"eventTimezone", "Europe/Berlin"}});
}

std::string cancelled(const std::string& parent, long long instant_s) {
    return document({{"eventStatus", "2"},
                     {"dtstart", "1767625200000"},
                     {"original_sync_id", parent},
                     {"originalInstanceTime", std::to_string(instant_s * 1000)}});
}

class HostSyncTest : public HostTest {
  protected:
    // Everything agrees, and another sync of each device finds nothing to do and writes nothing.
    void expect_agreement(TestDevice& a, TestDevice& b) {
        EXPECT_EQ(a.contents(), b.contents());
        const std::int64_t revision = cloud_revision();
        const int versions[] = {a.version(), b.version()};
        EXPECT_THAT(told(a.sync()), IsEmpty());
        EXPECT_THAT(told(b.sync()), IsEmpty());
        EXPECT_EQ(cloud_revision(), revision);
        EXPECT_THAT(versions, ElementsAre(a.version(), b.version()));
    }
};

TEST_F(HostSyncTest, EveryKindOfChangeTravels) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    NewEvent holiday;
    holiday.title = "holiday";
    holiday.start_s = 1767571200;  // 2026-01-05
    holiday.length_s = kDay;
    holiday.all_day = true;
    NewEvent dentist;
    dentist.title = "dentist";
    dentist.reminders = {10, 60};
    a.add(holiday);
    const int dentist_id = a.add(dentist);
    const int standup = a.add(weekly("standup"));

    EXPECT_THAT(told(a.sync()), ElementsAre("to cloud: new: holiday", "to cloud: new: dentist",
                                            "to cloud: new: standup"));
    EXPECT_THAT(told(b.sync()), ElementsAre("to device: new: holiday", "to device: new: dentist",
                                            "to device: new: standup"));
    expect_agreement(a, b);

    a.set_title(dentist_id, "dentist, moved");
    a.cancel_occurrence(standup, "20260112T150000Z");
    a.remove(a.find("holiday"));
    a.sync();
    b.sync();
    EXPECT_THAT(b.contents(),
                ElementsAre("dentist, moved 1767625200-1767628800 Europe/Berlin -10 -60",
                            "standup 1767625200-1767628800 Europe/Berlin every 1x2  10 times "
                            "without 20260112T150000Z"));
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, AMovedOccurrenceShowsAtItsNewTimeOnly) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    const int series = a.add(weekly("standup"));
    sync_all();
    NewEvent moved;
    moved.title = "standup, later";
    moved.start_s = kMonday + 7 * kDay + 7200;
    a.move_occurrence(series, "20260112T150000Z", moved);
    sync_all();
    EXPECT_THAT(b.contents(),
                ElementsAre("standup 1767625200-1767628800 Europe/Berlin every 1x2  10 times "
                            "without 20260112T150000Z",
                            "standup, later 1768237200-1768240800 Europe/Berlin"));
    expect_agreement(a, b);

    // A retitled series keeps its exceptions, whichever device it comes from.
    b.set_title(b.find("standup"), "daily");
    sync_all();
    EXPECT_THAT(a.contents(), Contains(HasSubstr("daily 1767625200")));
    EXPECT_THAT(a.contents(), Contains(HasSubstr("without 20260112T150000Z")));
    expect_agreement(a, b);

    // The moved event stands on its own: it outlives its series on both devices.
    b.remove(b.find("daily"));
    sync_all();
    EXPECT_THAT(a.contents(), ElementsAre("standup, later 1768237200-1768240800 Europe/Berlin"));
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, ANewSeriesBringsItsOccurrencesInTheSameSync) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    const int series = a.add(weekly("standup"));
    a.cancel_occurrence(series, "20260112T150000Z");
    a.cancel_occurrence(series, "20260119T150000Z");
    a.sync();
    b.sync();
    EXPECT_THAT(b.contents(), Contains(HasSubstr("without 20260112T150000Z 20260119T150000Z")));
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, OccurrencesAreDeliveredOnceAndTakenBack) {
    put("series", document({{"title", "class"},
                            {"dtstart", "1767625200000"},
                            {"dtend", "1767628800000"},
                            {"eventTimezone", "Europe/Berlin"},
                            {"rrule", "FREQ=WEEKLY;COUNT=4"}}));
    put("series#20260112T150000Z", cancelled("series", kMonday + 7 * kDay));
    put("series#20260119T150000Z", cancelled("series", kMonday + 14 * kDay));
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    a.sync();
    b.sync();
    const std::string both = "without 20260112T150000Z 20260119T150000Z";
    EXPECT_THAT(a.contents(), ElementsAre(HasSubstr(both)));

    put("series", document({{"title", "evening class"},
                            {"dtstart", "1767625200000"},
                            {"dtend", "1767628800000"},
                            {"eventTimezone", "Europe/Berlin"},
                            {"rrule", "FREQ=WEEKLY;COUNT=4"}}));
    sync_all();
    EXPECT_THAT(a.contents(), ElementsAre(HasSubstr(both)));

    put("series#20260112T150000Z", "");
    sync_all();
    EXPECT_THAT(a.contents(), ElementsAre(testing::AllOf(HasSubstr("without 20260119T150000Z"),
                                                         testing::Not(HasSubstr("20260112")))));
    expect_agreement(a, b);

    put("series", "");
    sync_all();
    EXPECT_THAT(a.contents(), IsEmpty());
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, AnOccurrenceWaitsForItsSeries) {
    put("series#20260112T150000Z", cancelled("series", kMonday + 7 * kDay));
    TestDevice& a = device("a");
    EXPECT_EQ(a.sync().count(qor::What::kPending), 1u);
    EXPECT_THAT(told(a.sync()), IsEmpty());
    put("series", document({{"title", "class"},
                            {"dtstart", "1767625200000"},
                            {"dtend", "1767628800000"},
                            {"rrule", "FREQ=WEEKLY;COUNT=4"}}));
    a.sync();
    EXPECT_THAT(a.contents(), ElementsAre(HasSubstr("without 20260112T150000Z")));
    a.with_database([](qor::HostDatabase& database) {
        EXPECT_EQ(qor::Items(database.connection()).counts().pending, 0);
    });
    EXPECT_THAT(told(a.sync()), IsEmpty());
}

TEST_F(HostSyncTest, OneBadItemStopsNothing) {
    put("bad", R"({"EVENT":{"title":"bad"},"REMINDERS":[{"error":"1"}]})");
    put("error", R"({"error":{"code":1},"EVENT":{"title":"refused"}})");
    put("good", simple("good"));
    TestDevice& a = device("a");
    NewEvent alarm;
    alarm.title = "alarm";
    alarm.reminders = {1767625200};
    alarm.reminder_unit = CALENDAR_ALARM_TIME_UNIT_SPECIFIC;
    const int alarm_id = a.add(alarm);
    a.add({});
    const qor::SyncReport report = a.sync();
    EXPECT_THAT(told(report),
                UnorderedElementsAre("to device: new: good", "to cloud: new: event",
                                     "put aside: bad", "put aside: refused", "put aside: item 1"));
    EXPECT_TRUE(report.partly());

    put("bad", simple("bad no more"));
    put("error", simple("accepted"));
    a.remove(alarm_id);
    EXPECT_THAT(told(a.sync()),
                UnorderedElementsAre("to device: new: bad no more", "to device: new: accepted"));
    EXPECT_THAT(told(a.sync()), IsEmpty());
}

struct ConflictCase {
    const char* name;
    qor::Policy policy;
    const char* on_a;  // title that A gives; null: deletes
    const char* on_b;
    std::vector<const char*> expected;  // titles in the end
    std::size_t kept;                   // documents in B's list of conflicts
};

class HostConflictTest : public HostSyncTest, public testing::WithParamInterface<ConflictCase> {};

TEST_P(HostConflictTest, NothingIsLost) {
    const ConflictCase& c = GetParam();
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    a.add({});
    sync_all();
    const auto edit = [](TestDevice& on, const char* title) {
        title == nullptr ? on.remove(on.find("event")) : on.set_title(on.find("event"), title);
    };
    edit(a, c.on_a);
    edit(b, c.on_b);
    a.sync();
    qor::SyncOptions options;
    options.policy = c.policy;
    b.sync(options);
    sync_all();
    std::vector<testing::Matcher<std::string>> expected;
    for (const char* title : c.expected) {
        expected.emplace_back(testing::StartsWith(std::string(title) + " 17"));
    }
    EXPECT_THAT(a.contents(), testing::ElementsAreArray(expected));
    b.with_database([&](qor::HostDatabase& database) {
        EXPECT_EQ(qor::Conflicts(database.connection()).list().size(), c.kept);
    });
    expect_agreement(a, b);
}

INSTANTIATE_TEST_SUITE_P(
    Policies, HostConflictTest,
    testing::Values(
        ConflictCase{"Cloud", qor::Policy::kCloud, "at home", "at work", {"at home"}, 1},
        ConflictCase{"Device", qor::Policy::kDevice, "at home", "at work", {"at work"}, 1},
        ConflictCase{"Newest", qor::Policy::kNewest, "at home", "at work", {"at work"}, 1},
        ConflictCase{"Both",
                     qor::Policy::kKeepBoth,
                     "at home",
                     "at work",
                     {"at home", "at work (this device)"},
                     0},
        ConflictCase{"SameEdit", qor::Policy::kCloud, "at home", "at home", {"at home"}, 0},
        ConflictCase{"CloudDeleted", qor::Policy::kCloud, nullptr, "at work", {}, 1},
        ConflictCase{
            "CloudDeletedKeep", qor::Policy::kKeepBoth, nullptr, "at work", {"at work"}, 0},
        ConflictCase{"DeviceDeleted", qor::Policy::kCloud, "at home", nullptr, {"at home"}, 0},
        ConflictCase{"DeviceDeletedWins", qor::Policy::kDevice, "at home", nullptr, {}, 1},
        ConflictCase{"BothDeleted", qor::Policy::kCloud, nullptr, nullptr, {}, 0}),
    [](const auto& each) { return std::string(each.param.name); });

TEST_F(HostSyncTest, AnUndecidedConflictWaits) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    a.add({});
    sync_all();
    a.set_title(a.find("event"), "at home");
    b.set_title(b.find("event"), "at work");
    a.sync();
    qor::SyncOptions ask;
    ask.policy = qor::Policy::kAsk;
    for (int i = 0; i < 2; ++i) {
        EXPECT_TRUE(b.sync(ask).partly());
        EXPECT_THAT(b.contents(), ElementsAre(testing::StartsWith("at work")));
    }
    ask.ask = [](const qor::Conflict&) { return qor::Winner::kDevice; };
    b.sync(ask);
    sync_all();
    EXPECT_THAT(a.contents(), ElementsAre(testing::StartsWith("at work")));
    expect_agreement(a, b);
}

// Between the listing of the device and its writing, while somebody is asked about a conflict.
TEST_F(HostSyncTest, AnEditMadeDuringASyncIsNotOverwritten) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    const int standup = a.add(weekly("standup"));
    a.add({});
    sync_all();
    a.cancel_occurrence(standup, "20260112T150000Z");
    sync_all();
    a.set_title(standup, "standup at ten");
    a.set_title(a.find("event"), "at home");
    a.sync();
    const int series = b.find("standup");
    const int event = b.find("event");
    b.set_title(event, "at work");
    qor::SyncOptions ask;
    ask.policy = qor::Policy::kAsk;
    int asked = 0;
    ask.ask = [&](const qor::Conflict&) {
        if (++asked == 1) {
            enter_cancellation(series, "20260119T150000Z");
            enter_title(event, "at work until six");
        }
        return qor::Winner::kCloud;
    };
    b.sync(ask);
    b.with_database([&](qor::HostDatabase& database) {
        const auto kept = qor::Conflicts(database.connection()).list();
        ASSERT_FALSE(kept.empty());
        EXPECT_THAT(kept.front().document + kept.back().document, HasSubstr("at work until six"));
    });
    sync_all();
    EXPECT_THAT(a.contents(),
                ElementsAre(testing::StartsWith("at home"),
                            "standup at ten 1767625200-1767628800 Europe/Berlin every 1x2  10 "
                            "times without 20260112T150000Z 20260119T150000Z"));
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, ASideThatLooksEmptyDeletesNothing) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    for (int i = 0; i < 12; ++i) {
        NewEvent event;
        event.title = "event " + std::to_string(i);
        a.add(event);
    }
    sync_all();
    const std::vector<std::string> all = b.contents();

    for (int i = 0; i < 7; ++i) {
        a.remove(a.find("event " + std::to_string(i)));
    }
    const qor::SyncReport stopped = a.sync();
    EXPECT_TRUE(stopped.stopped);
    EXPECT_THAT(stopped.entries.back().label, "7 of 12 events");
    b.sync();
    EXPECT_EQ(b.contents(), all);

    qor::SyncOptions allow;
    allow.allow_mass_delete = true;
    EXPECT_EQ(a.sync(allow).count(qor::What::kUploadDeletion), 7u);
    EXPECT_TRUE(b.sync().stopped);
    EXPECT_EQ(b.contents(), all);
    EXPECT_EQ(b.sync(allow).count(qor::What::kDeviceDeletion), 7u);
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, ALostCalendarIsBroughtBack) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    a.add(weekly("standup"));
    a.add({});
    sync_all();
    const std::vector<std::string> all = a.contents();
    namespace fs = std::filesystem;

    b.wipe_calendar();
    b.sync();
    EXPECT_EQ(b.contents(), all);
    expect_agreement(a, b);

    fs::remove(b.directory() / "opt/usr/data/cloud-qor/.qor-adapter-calendar.db");
    b.sync();
    EXPECT_EQ(b.contents(), all);
    expect_agreement(a, b);

    for (const auto& entry : fs::directory_iterator(directory())) {
        if (entry.path().filename().string().starts_with("cloud.db")) {
            fs::remove(entry.path());
        }
    }
    EXPECT_THROW(a.sync(), std::exception);
    a.with_database([](qor::HostDatabase& database) { qor::start_over(database); });
    b.with_database([](qor::HostDatabase& database) { qor::start_over(database); });
    sync_all();
    EXPECT_EQ(a.contents(), all);
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, TimesStayInEveryZoneAndLocale) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    NewEvent birthday;
    birthday.title = "birthday";
    birthday.start_s = 1767571200;
    birthday.length_s = kDay;
    birthday.all_day = true;
    birthday.frequency = CALENDAR_RECURRENCE_YEARLY;
    birthday.until_s = 1767571200 + 730 * kDay;
    NewEvent until = weekly("until");
    until.count = 0;
    until.zone = "America/New_York";
    until.until_s = kMonday + 21 * kDay;
    NewEvent nowhere;
    nowhere.title = "nowhere";
    nowhere.zone = "Mars/Olympus_Mons";
    a.add(birthday);
    a.add(until);
    a.add(nowhere);
    const std::vector<std::string> before = a.contents();
    const char* const zones[] = {"UTC",
                                 "Europe/Berlin",
                                 "America/New_York",
                                 "Asia/Kolkata",
                                 "Pacific/Kiritimati",
                                 "Pacific/Pago_Pago",
                                 "Asia/Tokyo",
                                 "America/St_Johns",
                                 "Australia/Lord_Howe",
                                 "Africa/Casablanca"};
    int trip = 0;
    for (const char* zone : zones) {
        SCOPED_TRACE(zone);
        setenv("TZ", zone, 1);
        tzset();
        const CompiledLocale there(++trip % 2 == 0 ? "de_DE" : "tr_TR", directory());
        sync_all();
        EXPECT_EQ(a.contents(), before);
        expect_agreement(a, b);
        // Send everything on another trip through both translations.
        b.set_title(b.find("until"), "on trip");
        sync_all();
        a.set_title(a.find("on trip"), "until");
    }
    unsetenv("TZ");
    tzset();
}

TEST_F(HostSyncTest, APreviewTellsAndChangesNothing) {
    TestDevice& a = device("a");
    TestDevice& b = device("b");
    a.add({});
    sync_all();
    a.set_title(a.find("event"), "changed");
    NewEvent added;
    added.title = "added";
    a.add(added);
    put("other", simple("other"));
    const std::vector<std::string> before = a.contents();
    const std::int64_t revision = cloud_revision();
    const int version = a.version();
    qor::SyncOptions preview;
    preview.dry_run = true;
    const std::vector<std::string> promised = told(a.sync(preview));
    EXPECT_THAT(promised, UnorderedElementsAre("to cloud: changed: changed", "to cloud: new: added",
                                               "to device: new: other"));
    EXPECT_EQ(told(a.sync(preview)), promised);
    EXPECT_EQ(a.contents(), before);
    EXPECT_EQ(a.version(), version);
    EXPECT_EQ(cloud_revision(), revision);
    EXPECT_EQ(told(a.sync()), promised);
    b.sync();
    expect_agreement(a, b);
}

TEST_F(HostSyncTest, WhatADeviceCannotHoldStaysInTheCloud) {
    put("rich", document({{"title", "rich"},
                          {"dtstart", "1767625200000"},
                          {"dtend", "1767628800000"},
                          {"accessLevel", "2"},
                          {"colour", "blue"}},
                         {5, 30}));
    TestDevice& a = device("a");
    a.sync();
    a.set_title(a.find("rich"), "richer");
    a.sync();
    const auto stored = nlohmann::json::parse(in_cloud("rich"));
    EXPECT_EQ(stored["EVENT"]["title"], "richer");
    EXPECT_EQ(stored["EVENT"]["colour"], "blue");
    EXPECT_EQ(stored["EVENT"]["accessLevel"], "2");
    EXPECT_EQ(stored["REMINDERS"].size(), 2u);
    EXPECT_EQ(stored["REMINDERS"][1]["minutes"], "30");
}

}  // namespace
}  // namespace bed
